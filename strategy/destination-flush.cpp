#include "strategy/destination-flush.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <map>
#include <memory>
#include <mutex>
#include <string>

#include "strategy/task-run-info.h"
#include "utils/confined-path.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

// The descriptors of the runs in hand. Shared, as a flush may be under way when its run ends.
struct OpenDestinations {
    std::mutex mutex;
    std::map<uint64_t, std::shared_ptr<const UniqueFd>> by_task;  // guarded by mutex
};

OpenDestinations& Destinations() {
    static OpenDestinations& destinations = *new OpenDestinations;
    return destinations;
}

std::shared_ptr<const UniqueFd> DescriptorOf(uint64_t task_id) {
    OpenDestinations& open = Destinations();
    const std::lock_guard lock(open.mutex);
    const auto found = open.by_task.find(task_id);
    return found == open.by_task.end() ? nullptr : found->second;
}

std::string NearestFolder(std::string path) {
    while (path.size() > 1 && !FSExists(path)) path = PathDirName(path);
    return path;
}

// What is to be flushed: the destination, or the root above it when nothing has been put there.
const std::string& FlushPath(const TaskRunInfo& task) {
    return task.dst_root && !FSExists(task.dst_dir_path) ? task.dst_root->Path()
                                                         : task.dst_dir_path;
}

// A file system may have been mounted on the way since the run began.
bool IsOnSameDevice(int fd, const std::string& path) {
    struct stat held {};
    struct stat now {};
    const UniqueFd folder = PathPlace(path).Open(O_PATH);
    return folder.IsValid() && fstat(folder.Get(), &now) == 0 && fstat(fd, &held) == 0 &&
           held.st_dev == now.st_dev;
}

int Flush(const TaskRunInfo& task) {
    const std::string& path = FlushPath(task);
    const std::shared_ptr<const UniqueFd> held = DescriptorOf(task.task_id);
    if (held == nullptr) return FSSyncFileSystem(path);
    if (syncfs(held->Get()) != 0) {
        SLOG_ERR("Failed to flush through the descriptor of the run. %s", std::strerror(errno));
        return -1;
    }
    return IsOnSameDevice(held->Get(), path) ? 0 : FSSyncFileSystem(path);
}

}  // namespace

DestinationFlush::DestinationFlush(const TaskRunInfo& task) : m_task_id(task.task_id) {
    auto folder = std::make_shared<UniqueFd>(
        PathPlace(NearestFolder(task.dst_dir_path)).Open(O_RDONLY | O_DIRECTORY | O_NONBLOCK));
    if (!folder->IsValid()) return;  // each flush opens it then, or fails
    OpenDestinations& open = Destinations();
    const std::lock_guard lock(open.mutex);
    open.by_task[m_task_id] = std::move(folder);
}

DestinationFlush::~DestinationFlush() {
    OpenDestinations& open = Destinations();
    const std::lock_guard lock(open.mutex);
    open.by_task.erase(m_task_id);
}

int FlushDestination(const TaskRunInfo& task) {
    SLOG_DBG("Flush of '%s' begins", task.dst_dir_path.c_str());
    if (Flush(task) == 0) {
        SLOG_DBG("Flush of '%s' is done", task.dst_dir_path.c_str());
        return 0;
    }
    SLOG_ERR("Failed to flush file system of '%s' for task '%llu'", task.dst_dir_path.c_str(),
             Llu(task.task_id));
    return -1;
}
