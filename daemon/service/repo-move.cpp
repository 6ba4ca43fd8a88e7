#include "service/repo-move.h"

#include <sys/stat.h>

#include "platform/global-setting.h"
#include "platform/sdk-service.h"
#include "service/repository.h"
#include "service/scratch-folder.h"
#include "service/usable-volume.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr char CP[] = "/bin/cp";
constexpr char MV[] = "/bin/mv";

bool IsFolder(const std::string& path) {
    struct stat info = {};
    return stat(path.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

bool FailMove(const std::string& from, const std::string& to) {
    SLOG_ERR("%s:%d FAIL: mv %s %s", __FILE__, __LINE__, from.c_str(), to.c_str());
    return false;
}

bool Move(const std::string& from, const std::string& to) {
    return SDK::RunProgram(MV, {from, to}) == 0 || FailMove(from, to);
}

class RepoMove {
public:
    RepoMove(const std::string& from, const std::string& to)
        : m_from(from),
          m_to(to),
          m_source(RepositoryPath(from)),
          m_target(RepositoryPath(to)),
          m_from_scratch(from),
          m_to_scratch(to),
          m_registered(GetRepoVolPath()) {}

    bool Run() {
        if (IsSameFolder(m_from, m_to) || IsSameFolder(m_source, m_target)) return FailCopy();
        if (IsSameFolder(m_registered, m_to) && IsFolder(m_target)) return KeepSource();
        m_from_scratch.RemoveLeftovers();
        m_to_scratch.RemoveLeftovers();
        if (!Copy()) {
            m_to_scratch.Remove(m_to_scratch.Place());
            return FailCopy();
        }
        return PutInPlace() && PutAwaySource();
    }

private:
    bool FailCopy() const {
        SLOG_ERR("%s:%d FAIL: cp -rf %s %s", __FILE__, __LINE__, m_source.c_str(),
                 m_to_scratch.Place().c_str());
        return false;
    }

    // The repository in use is not replaced by what a move has left, or by one of former times.
    bool KeepSource() const {
        return m_from_scratch.Keep(m_source) || FailMove(m_source, m_from_scratch.Place());
    }

    // The copy is on the disk when this is true: all that follows builds on it.
    bool Copy() const {
        if (!CanBeRegistered(m_to) || !IsFolder(m_to) || !m_to_scratch.ClearPlace()) return false;
        return SDK::RunProgram(CP, {"-rf", m_source, m_to_scratch.Place()}) == 0 &&
               FSSyncFileSystem(m_to) == 0;
    }

    bool PutInPlace() const {
        // Before anything is changed: afterwards a place that is taken could not be told from a
        // source that has moved.
        if (!m_from_scratch.ClearPlace()) return FailMove(m_source, m_from_scratch.Place());
        // A repository of former times, perhaps with tasks that nothing else knows.
        if (!m_to_scratch.Keep(m_target)) return FailMove(m_to_scratch.Place(), m_target);
        if (Move(m_to_scratch.Place(), m_target) && FSSyncFileSystem(m_to) == 0 &&
            RegisterVolume(m_to) == 0) {
            return true;
        }
        RestoreRegistered();
        return false;
    }

    bool PutAwaySource() const {
        if (Move(m_source, m_from_scratch.Place())) {
            m_from_scratch.Remove(m_from_scratch.Place());
            return true;
        }
        // A move between file systems may have begun to take the source away.
        if (IsFolder(m_source) && !FSExists(m_from_scratch.Place())) RestoreRegistered();
        return false;
    }

    void RestoreRegistered() const {
        if (GetRepoVolPath() == m_to) (void)!RegisterVolume(m_registered);
    }

    std::string m_from;
    std::string m_to;
    std::string m_source;
    std::string m_target;
    ScratchFolder m_from_scratch;
    ScratchFolder m_to_scratch;
    std::string m_registered;  // before the move
};

}  // namespace

bool MoveRepoData(const std::string& from, const std::string& to) {
    return RepoMove(from, to).Run();
}
