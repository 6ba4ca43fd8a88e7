#include "workers-fixture.h"

#include <unistd.h>

#include <filesystem>

#include "processor/processor.h"

namespace {

constexpr unsigned STEP_US = 1000;

}  // namespace

void WaitUntil(const std::function<bool()>& is_true) {
    while (!is_true()) usleep(STEP_US);
}

void Gate::Hold(const std::function<bool()>& may_go_on) {
    m_is_reached = true;
    WaitUntil([&] { return m_is_open || may_go_on(); });
}

void Gate::WaitForWorker() const {
    WaitUntil([this] { return m_is_reached.load(); });
}

WorkersTest::WorkersTest() {
    Processor::SetWaitStepForTest(STEP_US);
    StartWorkers();
}

std::shared_ptr<Gate> WorkersTest::HoldCopies() {
    auto gate = std::make_shared<Gate>();
    m_fake.OnCall("KELDFileCopy_r", [gate, this] {
        gate->Hold([this] { return m_log.Contains("Ferrixd: AbortTask"); });
    });
    return gate;
}

uint64_t WorkersTest::AddRunningTask(const std::string& name, const std::string& folder) {
    PlugIn(name, "u-" + name);
    m_dir.MakeDir("v1/photos" + folder);
    for (int i = 0; i < 20; ++i) m_dir.Write("m/" + name + "/f" + std::to_string(i), "content");
    PObject request = AddRequest(name, "u-" + name);
    request["run_when_plug_in"] = true;
    request["eject_when_task_done"] = false;
    request["hub_folder_path"] = folder;
    const PObject response = Send("add_task", request);
    EXPECT_THAT(response, IsSuccess());
    return response["task_id"].AsUInt64();
}

PObject WorkersTest::OnlyTask() {
    const PObject response = Send("list_task");
    return response["task_list"][0];
}

std::string WorkersTest::Status(uint64_t task_id) {
    return Send("get_task_setting", ForTask(task_id))["task_status"].AsString();
}

void WorkersTest::RunToTheEnd(uint64_t task_id) {
    EXPECT_THAT(Send("run_task", ForTask(task_id)), IsSuccess());
    WaitUntil([&] {
        const std::string status = Status(task_id);
        return status != "waiting" && status != "copying";
    });
}

size_t WorkersTest::CountFiles(const std::string& folder) const {
    size_t count = 0;
    for (const auto& entry : std::filesystem::directory_iterator(m_volume + "/photos" + folder)) {
        if (entry.is_regular_file()) ++count;
    }
    return count;
}
