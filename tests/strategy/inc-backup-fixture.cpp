#include "inc-backup-fixture.h"

#include <cstdlib>
#include <ctime>

#include "db/task-info.h"
#include "platform/error-handler.h"
#include "strategy/copy-strategy-handler.h"
#include "strategy/task-handler.h"

namespace {

// Does the events of the run at once, on the same thread, so that nothing is waited for.
class RunAtOnce final : public TaskHandler {
public:
    explicit RunAtOnce(std::function<void()> work) : m_work(std::move(work)) {}

    int DoHandle() override {
        const int result = TaskHandler::DoHandle();
        m_work();
        return result;
    }

private:
    std::function<void()> m_work;
};

}  // namespace

IncBackupFixture::IncBackupFixture() {
    SetTimeZone("UTC");
    m_task.copy_strategy = COPY_STRATEGY_INCREMENTAL;
    m_task.conflict_policy = CONFLICT_POLICY_OVERWRITE;
    m_task.strategy_handler = CreateCopyStrategyHandler(COPY_STRATEGY_INCREMENTAL);
    ReopenFileDB();
    m_processor.SetStatus(PROCESSOR_RUNNING);
}

IncBackupFixture::~IncBackupFixture() {
    m_processor.SetStatus(PROCESSOR_STOPPED);
    SetTimeZone("UTC");
}

void IncBackupFixture::SetNaming(bool keep_dir_structure, bool smart_create_date_dir,
                                 bool rename_photo_video) {
    m_task.keep_dir_structure = keep_dir_structure;
    m_task.smart_create_date_dir = smart_create_date_dir;
    m_task.rename_photo_video = rename_photo_video;
}

void IncBackupFixture::SetRenamePolicy() { m_task.conflict_policy = CONFLICT_POLICY_RENAME; }

void IncBackupFixture::SetTimeZone(const char* name) {
    setenv("TZ", name, 1);
    tzset();
}

int IncBackupFixture::RunTask() {
    auto& outcomes = Ferrix::ErrorHandler::GetInstance();
    outcomes.Clear(TASK_ID);
    RunAtOnce run([this] { m_failures = DrainEvents(); });
    run.SetTask(&m_task);
    run.SetProcessor(&m_processor);
    run.SetAbortFlag(&m_abort);
    outcomes.Set(TASK_ID, run.Run());
    return outcomes.Get(TASK_ID);
}

void IncBackupFixture::RunWell() {
    EXPECT_EQ(0, RunTask());
    EXPECT_THAT(m_failures, testing::IsEmpty());
}

int IncBackupFixture::TakeCopies() {
    const int count = m_fake.CallCount("KELDFileCopy_r");
    m_fake.ForgetCalls();
    return count;
}

void IncBackupFixture::ReopenFileDB() {
    m_context.Reset();
    m_task.file_db.reset();
    m_task.file_db = std::make_shared<FileDB>();
    ASSERT_EQ(0, m_task.file_db->Init(FileDBPath()));
}

std::string IncBackupFixture::Recorded(const std::string& source_path) {
    FileInfo info;
    return m_task.file_db->GetFileInfoBySourcePath(source_path, info) == 1 ? info.destination_path
                                                                           : "-";
}

std::string IncBackupFixture::FileDBPath() const {
    return m_dir / "volume1/@Ferrix/task/7/file-db.sqlite";
}
