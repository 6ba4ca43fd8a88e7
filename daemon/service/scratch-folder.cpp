#include "service/scratch-folder.h"

#include <sys/stat.h>

#include <cerrno>

#include "platform/sdk-service.h"
#include "service/repository.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr char RM[] = "/bin/rm";
constexpr char KEPT[] = "@Ferrix.replaced";
constexpr char REMOVED[] = "@Ferrix.removed";
constexpr int MAX_NUMBER = 100;

void LogFailure(const std::string& path) {
    SLOG_ERR("%s:%d FAIL: rm -rf %s", __FILE__, __LINE__, path.c_str());
}

void StartRemoval(const std::string& path) {
    if (SDK::StartProgram(RM, {"-rf", path}) != 0) LogFailure(path);
}

}  // namespace

ScratchFolder::ScratchFolder(const std::string& volume)
    : m_path(volume + "/@tmp"), m_place(RepositoryPath(m_path)) {}

// Whatever the umask: others may not put something in the place of a repository under way.
bool ScratchFolder::Make() const {
    if (mkdir(m_path.c_str(), 0700) == 0) return true;
    struct stat info = {};
    return errno == EEXIST && stat(m_path.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

bool ScratchFolder::ClearPlace() const { return Make() && FSRemove(m_place) == 0; }

std::string ScratchFolder::Numbered(const char* name, int number) const {
    const std::string path = m_path + "/" + name;
    return number == 1 ? path : path + "." + std::to_string(number);
}

// Empty when all are taken.
std::string ScratchFolder::FreeName(const char* name) const {
    for (int number = 1; number <= MAX_NUMBER; ++number) {
        std::string path = Numbered(name, number);
        if (!FSExists(path)) return path;
    }
    return "";
}

bool ScratchFolder::Keep(const std::string& path) const {
    if (!FSExists(path)) return true;
    const std::string kept = FreeName(KEPT);
    if (kept.empty() || !Make() || FSRename(path, kept) < 0) return false;
    SLOG_NOTICE("The repository '%s' is kept as '%s'\n", path.c_str(), kept.c_str());
    return true;
}

// Under a name that only ever holds what is to go: the program may still be at work when the place
// is used again.
void ScratchFolder::Remove(const std::string& path) const {
    if (!FSExists(path)) return;
    const std::string doomed = FreeName(REMOVED);
    if (doomed.empty() || FSRename(path, doomed) < 0) return LogFailure(path);
    StartRemoval(doomed);
}

void ScratchFolder::RemoveLeftovers() const {
    for (int number = 1; number <= MAX_NUMBER; ++number) {
        const std::string path = Numbered(REMOVED, number);
        if (FSExists(path)) StartRemoval(path);
    }
}
