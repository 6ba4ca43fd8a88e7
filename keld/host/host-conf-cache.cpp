// The state of host.conf in force, and when it is read anew.
#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <mutex>
#include <optional>

#include "host/host-cache.h"
#include "host/host-conf.h"
#include "host/host-paths.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace keld_host {
namespace {

// 64 MiB: far beyond any real file; a mistake shall not fill the memory of a small box.
constexpr off_t MAX_CONF_SIZE = off_t{64} << 20;

struct Cache {
    std::mutex mutex;
    std::shared_ptr<const HostConf> conf;
    FileStamp stamp;
    // What was found last, so that the same finding is told once.
    std::optional<std::string> text;
    int readError = 0;
};

Cache& TheCache() {
    static Cache cache;
    return cache;
}

std::shared_ptr<const HostConf> DefaultConf() {
    auto conf = std::make_shared<HostConf>();
    HostConfError error;
    // The empty text has no errors.
    static_cast<void>(ParseHostConf("", *conf, error));
    return conf;
}

// Reads the file and its stamp. Returns 0, or an errno: ENOENT when there is no file.
int ReadConf(const std::string& path, std::string& text, FileStamp& stamp) {
    // O_NONBLOCK: a FIFO by mistake must not hold us up.
    const UniqueFd fd(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    if (!fd.IsValid()) return errno;
    struct stat info {};
    if (fstat(fd.Get(), &info) != 0) return errno;
    stamp = FileStamp::Take(info);
    if (!S_ISREG(info.st_mode)) return EINVAL;
    if (info.st_size > MAX_CONF_SIZE) return EFBIG;
    text.clear();
    char buffer[16384];
    for (;;) {
        const ssize_t length = read(fd.Get(), buffer, sizeof(buffer));
        if (length < 0 && errno == EINTR) continue;
        if (length < 0) return errno;
        if (length == 0) return 0;
        text.append(buffer, static_cast<size_t>(length));
        if (static_cast<off_t>(text.size()) > MAX_CONF_SIZE) return EFBIG;
    }
}

void TakeText(Cache& cache, const std::string& path, std::string text) {
    if (cache.text == text) return;
    auto conf = std::make_shared<HostConf>();
    HostConfError error;
    if (ParseHostConf(text, *conf, error)) {
        cache.conf = std::move(conf);
    } else {
        SLOG_ERR("%s(%d): %s; the last good state stays in force\n", path.c_str(), error.line,
                 error.reason.c_str());
    }
    cache.text = std::move(text);
}

void Refresh(Cache& cache) {
    const std::string& path = Paths().hostConf;
    std::string text;
    FileStamp stamp;
    const int error = ReadConf(path, text, stamp);
    cache.stamp = stamp;
    if (error == 0) {
        TakeText(cache, path, std::move(text));
    } else if (error == ENOENT || error == ENOTDIR) {
        if (cache.readError != error) cache.conf = DefaultConf();
        cache.text.reset();
    } else if (cache.readError != error) {
        SLOG_ERR("cannot read '%s': %s; the last good state stays in force\n", path.c_str(),
                 strerror(error));
        cache.text.reset();
    }
    cache.readError = error;
    if (!cache.conf) cache.conf = DefaultConf();
}

}  // namespace

std::shared_ptr<const HostConf> CurrentHostConf() {
    Cache& cache = TheCache();
    const std::lock_guard lock(cache.mutex);
    if (!cache.conf || cache.stamp.HasChanged(Paths().hostConf)) Refresh(cache);
    return cache.conf;
}

void DropHostConf() {
    Cache& cache = TheCache();
    const std::lock_guard lock(cache.mutex);
    cache.conf.reset();
    cache.stamp = {};
    cache.text.reset();
    cache.readError = 0;
}

}  // namespace keld_host
