// A mirror task on scratch folders: a device and a share of the scripted platform, their entries in
// the registry, and verbs to hand an event to a handler or to work off a whole run.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <string>
#include <vector>

#include "event/event.h"
#include "fake/fake-keld.h"
#include "processor/processor.h"
#include "processor/task-entry-handler.h"
#include "strategy/file-event-context.h"
#include "strategy/file-event-handler.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

class FileFilter;

class StrategyFixture : public testing::Test {
protected:
    static constexpr uint64_t TASK_ID = 7;
    static constexpr uint64_t USB_ID = 3;

    StrategyFixture();
    ~StrategyFixture() override;

    // Full paths: of the source and the destination folder, and below them.
    [[nodiscard]] std::string Src(const std::string& path = "") const;
    [[nodiscard]] std::string Dst(const std::string& path = "") const;
    // Files with a fixed date, so that pairs are equal unless a test says otherwise.
    void WriteSrc(const std::string& path, const std::string& content, time_t mtime = 1000) const;
    void WriteDst(const std::string& path, const std::string& content, time_t mtime = 1000) const;
    void MakeSrcDir(const std::string& path) const;
    void MakeDstDir(const std::string& path) const;
    // Turns the task round: from the share to the device.
    void MakeExport();
    // The task filter gets this black list file, or loses its lists' file altogether with null.
    void SetTaskFilterNames(const std::vector<std::string>& black_names);

    // Gives the event to the handler and has it handled.
    template <typename Handler>
    int Handle(Handler&& handler, EventType type, const std::string& path, uint32_t flags = 0) {
        PrepareContext(type, path, flags);
        GiveContext(handler);
        return handler.Handle();
    }
    int HandleCopy(const std::string& path);
    int HandleCreate(const std::string& path);
    int HandleRemove(const std::string& path, bool is_dir);
    int HandleScan(const std::string& path);

    void PrepareContext(EventType type, const std::string& path, uint32_t flags);
    void GiveContext(FileEventHandler& handler);

    // What was pushed since the last call, in the order of the pushes, as "scan /a", "create /a",
    // "copy /a", "remove /a" and "remove /a/" for a folder. The events themselves are dropped.
    std::vector<std::string> TakeIssued();

    // Works off all events of the task like a file worker: each outcome of an event that is to be
    // run again is tried three more times. Returns the outcomes that were not 0, as "path: code".
    std::vector<std::string> DrainEvents();
    int Dispatch(const Event& event);

    TempDir m_dir;
    FakeKeld& m_fake;
    LogCapture m_log;
    std::string m_usb;    // mount path of the device
    std::string m_share;  // path of the share
    Processor m_processor;
    std::atomic<int> m_abort{0};
    TaskRunInfo m_task;
    FileEventContext m_context;
};

// What stands below a folder: each path with "/" behind a folder, "=content" behind a file and
// "@date" (files only); sorted. Recycle bins are left out.
std::vector<std::string> TreeOf(const std::string& root);
// The same without dates.
std::vector<std::string> NamesOf(const std::string& root);
void SetMtime(const std::string& path, time_t mtime);
time_t MtimeOf(const std::string& path);
bool IsThere(const std::string& path);
