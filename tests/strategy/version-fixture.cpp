#include "version-fixture.h"

#include <algorithm>
#include <cstdlib>
#include <ctime>
#include <filesystem>

#include "db/log-db.h"
#include "db/log-info.h"
#include "db/task-info.h"
#include "strategy/copy-strategy-handler.h"

namespace fs = std::filesystem;

VersionFixture::VersionFixture() {
    EXPECT_EQ(0, LogDB::GetInstance().Init(m_dir / "log-db.sqlite"));
    m_task.copy_strategy = COPY_STRATEGY_VERSION;
    m_task.strategy_handler = CreateCopyStrategyHandler(COPY_STRATEGY_VERSION);
    m_task.rotation_policy = ROTATION_POLICY_OLDEST;
    SetVersionDir(RUN_DIR);
    m_log.Clear();
}

VersionFixture::~VersionFixture() { LogDB::GetInstance().Close(); }

void VersionFixture::SetVersionDir(const std::string& name) {
    m_task.version_dir = name;
    TaskEntryHandler::GetInstance().AddTaskEntry(m_task);
}

std::string VersionFixture::MakeVersion(const std::string& name) const {
    WriteDst("/" + name + "/file", "old");
    return Dst("/" + name);
}

std::vector<std::string> VersionFixture::Versions() const {
    std::vector<std::string> names;
    for (const auto& entry : fs::directory_iterator(Dst())) {
        names.push_back(entry.path().filename().string());
    }
    std::sort(names.begin(), names.end());
    return names;
}

std::string VersionFixture::MarksPath() const {
    return m_dir / "volume1/@Ferrix/task/7/version-marks";
}

std::vector<VersionMark> VersionFixture::Marks() {
    std::vector<VersionMark> marks;
    EXPECT_EQ(0, ReadVersionMarks(TASK_ID, marks));
    return marks;
}

std::vector<std::string> VersionFixture::RotatedRows() {
    LogFilter filter;
    filter.task_id = TASK_ID;
    filter.description_ids = {LogDescription::LOG_DESC_ROTATED};
    std::vector<LogInfo> rows;
    EXPECT_EQ(0, LogDB::GetInstance().ListLogInfo(filter, rows));
    std::vector<std::string> texts;
    for (auto row = rows.rbegin(); row != rows.rend(); ++row) {
        texts.push_back(row->description_param);
    }
    return texts;
}

TimeZone::TimeZone(const char* zone) {
    setenv("TZ", zone, 1);
    tzset();
}

TimeZone::~TimeZone() {
    unsetenv("TZ");
    tzset();
}
