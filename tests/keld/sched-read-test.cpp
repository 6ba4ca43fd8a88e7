#include "host/sched-read.h"

#include <gtest/gtest.h>
#include <keld/error.h>
#include <keld/sched.h>

#include "host/host-paths.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

using keld_host::ReadSchedule;
using keld_host::SchedReading;

namespace {

class SchedRead : public ::testing::Test {
protected:
    SchedRead() {
        keld_host::HostPaths paths;
        paths.schedFolder = m_dir / "lib/keld/sched";
        paths.cronFile = m_dir / "etc/cron.d/keld-sched";
        keld_host::SetPaths(paths);
    }
    ~SchedRead() override { keld_host::SetPaths({}); }

    // The id of a stored entry with these members of a timetable.
    static int Store(const std::string& members, int enabled = 1) {
        KELDSchedTask* entry = KELDSchedTaskAlloc();
        KELDSchedCTaskSetState(entry, enabled);
        const std::string json = "{\"schedule\":{" + members + "}}";
        EXPECT_TRUE(KELDSchedTaskConvertFromJson_Schedule(json.c_str(), entry)) << members;
        EXPECT_EQ(0, KELDSchedTaskSave(entry));
        int id = 0;
        EXPECT_EQ(0, KELDSchedCTaskGetID(&id, entry));
        KELDSchedTaskFree(entry);
        return id;
    }
    static std::string JsonOf(int id) {
        SchedReading reading;
        EXPECT_EQ(KELDERR_SUCCESS, ReadSchedule(id, reading));
        return reading.json;
    }
    void ExpectUnreadable(int64_t id, int error) {
        SchedReading reading{true, "as before"};
        EXPECT_EQ(error, ReadSchedule(id, reading)) << id;
        EXPECT_TRUE(reading.isEnabled);
        EXPECT_EQ("as before", reading.json);
    }

    TempDir m_dir;
};

}  // namespace

TEST_F(SchedRead, ATimetableIsGivenUnderTheKeysOfClients) {
    EXPECT_EQ(
        "{\"date\":\"2030/12/24\",\"date_type\":1,\"hour\":4,\"last_work_hour\":20,\"minute\":30,"
        "\"repeat_date\":1002,\"repeat_hour\":1,\"repeat_min\":15,"
        "\"week_day\":\"0,1,2,3,4,5,6\"}",
        JsonOf(
            Store("\"hour\":4,\"min\":30,\"date_type\":1,\"date\":\"2030/12/24\",\"repeat\":1002,"
                  "\"repeat_hour\":1,\"repeat_min\":15,\"last_work_hour\":20")));
    EXPECT_EQ(
        "{\"date_type\":0,\"hour\":3,\"last_work_hour\":23,\"minute\":0,\"repeat_date\":0,"
        "\"repeat_hour\":0,\"repeat_min\":0,\"week_day\":\"1,5\"}",
        JsonOf(Store("\"hour\":3,\"week_name\":\"5,1\"")));
}

TEST_F(SchedRead, AnEntryWithoutATimetableIsAnObjectWithoutMembers) {
    EXPECT_EQ("{}", JsonOf(Store("")));
}

TEST_F(SchedRead, EnabledOrNotIsTold) {
    for (const int enabled : {0, 1}) {
        SchedReading reading;
        EXPECT_EQ(KELDERR_SUCCESS, ReadSchedule(Store("\"hour\":3", enabled), reading));
        EXPECT_EQ(enabled == 1, reading.isEnabled);
    }
}

TEST_F(SchedRead, AnEntryThatIsNotThereIsTold) {
    const int id = Store("\"hour\":3");
    for (const int64_t missing :
         {int64_t{-1}, int64_t{0}, int64_t{id} + 1, int64_t{id} + (int64_t{1} << 32)}) {
        ExpectUnreadable(missing, KELDERR_SRC_MISS);
    }
    EXPECT_EQ(0, KELDSchedTaskRemove(id));
    ExpectUnreadable(id, KELDERR_SRC_MISS);
}

TEST_F(SchedRead, ADamagedEntryIsTold) {
    const int id = Store("\"hour\":3");
    const LogCapture log;
    for (const std::string& text : {std::string(), std::string("{"), std::string("[]"),
                                    std::string(100000, '['), std::string("{\"id\":1}")}) {
        m_dir.Write("lib/keld/sched/" + std::to_string(id) + ".json", text);
        ExpectUnreadable(id, KELDERR_IO);
    }
}
