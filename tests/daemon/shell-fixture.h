// A box for tests of the daemon's shell: the scripted platform, a scratch package folder and a
// scratch repository; nothing is linked yet.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "daemon/app.h"
#include "fake/fake-keld.h"
#include "ipc/pobject.h"
#include "processor/processor.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

// The unit tests' way in to the application object.
class FerrixdPeer {
public:
    static void Handle(Ferrixd& app, const PObject& request, PObject& response) {
        app.HandleMessage(request, response);
    }
    static void WakeWithoutMessage(Ferrixd& app) { pthread_cond_broadcast(&app.m_queue_cond); }
    static bool IsRunning(const Ferrixd& app) { return app.m_running != 0; }
    static size_t QueueSize(const Ferrixd& app) { return app.m_queue.size(); }
    static size_t ProcessorCount(const Ferrixd& app) { return app.m_processor_count; }
    static Processor* ProcessorAt(const Ferrixd& app, size_t i) { return app.m_processors[i]; }
    static void AbortTask(Ferrixd& app, uint64_t task_id) { app.AbortTask(task_id); }
    static void PauseProcessors(Ferrixd& app) { app.PauseProcessors(); }
    static void ResumeProcessors(Ferrixd& app) { app.ResumeProcessors(); }
    static void PauseAll(Ferrixd& app) { app.PauseAll(); }
    static void ResumeAll(Ferrixd& app) { app.ResumeAll(); }
    static std::vector<std::string> Actions(const Ferrixd& app) { return Names(app.m_actions); }
    static std::vector<std::string> Hooks(const Ferrixd& app) { return Names(app.m_hooks); }

private:
    template <typename Table>
    static std::vector<std::string> Names(const Table& table) {
        std::vector<std::string> names;
        for (const auto& [name, handler] : table) names.push_back(name);
        return names;
    }
};

class ShellTest : public testing::Test {
protected:
    ShellTest();
    ~ShellTest() override;

    // A message as the socket loop hands it over, on this thread; the response without "ack".
    PObject Handle(const PObject& request);
    // {"action": name}
    [[nodiscard]] static PObject Action(const std::string& name);
    // The place of a line in the log; a failure when it is not there.
    [[nodiscard]] size_t PlaceOf(const std::string& line) const;

    FakeKeld& m_fake;
    TempDir m_dir;
    std::string m_db_folder;
    LogCapture m_log;
    Ferrixd m_app;
};
