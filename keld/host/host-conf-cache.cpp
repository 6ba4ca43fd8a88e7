// The state of host.conf in force, and when it is read anew.
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <mutex>
#include <optional>

#include "host/host-cache.h"
#include "host/host-conf.h"
#include "host/host-paths.h"
#include "host/replace-file.h"
#include "utils/log.h"

namespace keld_host {
namespace {

// 64 MiB: far beyond any real file; a mistake shall not fill the memory of a small box.
constexpr size_t MAX_CONF_SIZE = size_t{64} << 20;

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
    struct stat info {};
    const int error = ReadFile(path, MAX_CONF_SIZE, text, info);
    cache.stamp = info.st_mode != 0 ? FileStamp::Take(info) : FileStamp{};  // 0: none was found
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
