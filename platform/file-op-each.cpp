#include <cerrno>
#include <utility>
#include <vector>

#include "filter/file-filter.h"
#include "utils/error-code.h"
#include "utils/file-list.h"
#include "utils/file-op.h"
#include "utils/log.h"

static_assert(FS_EACH_IO_ERROR == ERR_IO, "callers hand it on as an outcome");

bool IsIgnored(const FSDirEntry& entry, const std::string& full_path, size_t prefix_length,
               FileFilter* filter) {
    if (filter == nullptr) return false;
    const std::string_view whole(full_path);
    const std::string_view path =
        prefix_length < whole.size() ? whole.substr(prefix_length) : std::string_view("/");
    const int reason = filter->Check(path, entry.type == FS_TYPE_DIR);
    if (reason == 0) return false;
    SLOG_INFO("IsIgnored: File '%.*s' (blocked: %d)\n", static_cast<int>(path.size()), path.data(),
              reason);
    return true;
}

namespace {

struct SubDir {
    std::string name;
    int index;  // in the list
};

bool IsSkipped(const std::string& name) { return name == "." || name == ".." || name == "@eaDir"; }

// Whether the errno of opening a folder tells of the folder itself: it is gone, something else,
// closed to us, or cannot be there under that name. All others tell that the system could not look.
bool CountsAsEmpty(int error) {
    return error == ENOENT || error == ENOTDIR || error == ELOOP || error == EACCES ||
           error == EPERM || error == ENAMETOOLONG || error == EILSEQ;
}

void LogDir(const FSVisitor& visitor, const std::string& name, int index) {
    if (index < 0) {
        SLOG_ERR("FileProcessor (%d): local list: add dir '%s'\n", visitor.worker_id, name.c_str());
    } else {
        SLOG_INFO("FileProcessor (%d): local list: add directory '%s'\n", visitor.worker_id,
                  name.c_str());
    }
}

// One walk: the folder in hand, and those above it with what is left of them.
class Walk {
public:
    Walk(const FSVisitor& visitor, unsigned flags, const std::atomic<int>* abort_flag,
         bool recursive)
        : m_visitor(visitor), m_flags(flags), m_abort_flag(abort_flag), m_recursive(recursive) {}

    int Run(const std::string& path) {
        m_path = path;
        m_frames.push_back({{}, m_path.size(), m_visitor.dir_index});
        int result = ListFolder();
        while (result == 0 && !m_frames.empty()) {
            Frame& top = m_frames.back();
            m_path.resize(top.path_length);
            result = top.sub_dirs.empty() ? Leave() : Enter();
        }
        // The folder in hand has told of its failure; those above it tell that they end too.
        while (result != 0 && m_frames.size() > 1) {
            m_frames.pop_back();
            m_path.resize(m_frames.back().path_length);
            LogAbort();
        }
        return result;
    }

private:
    struct Frame {
        std::vector<SubDir> sub_dirs;  // still to be gone into; the last one is in hand
        size_t path_length;
        int list_index;
    };

    [[nodiscard]] bool IsAborted() const {
        return m_abort_flag != nullptr && m_abort_flag->load() != 0;
    }
    void LogAbort() const { SLOG_INFO("Traversing '%s' ... abort\n", m_path.c_str()); }

    int Enter() {
        const SubDir& sub = m_frames.back().sub_dirs.back();
        m_path.append("/").append(sub.name);
        const int index = sub.index;
        m_frames.push_back({{}, m_path.size(), index});
        return ListFolder();
    }

    int Leave() {
        m_frames.pop_back();
        if (m_frames.empty()) return 0;
        std::vector<SubDir>& sub_dirs = m_frames.back().sub_dirs;
        if ((m_flags & FS_EACH_DIR_LAST) != 0) {
            LogDir(m_visitor, sub_dirs.back().name, sub_dirs.back().index);
        }
        sub_dirs.pop_back();
        return 0;
    }

    // Takes the entries of the folder in hand; its path is back in m_path at the end.
    int ListFolder() {
        FSDir dir;
        const uint32_t dir_flags = (m_flags & FS_EACH_STAT) != 0 ? FS_DIR_STAT : 0;
        if (FSOpenDir(m_path, dir_flags, dir) != 0) {
            const int error = errno;
            SLOG_ERR("FSOpenDir(%s)\n", m_path.c_str());
            return CountsAsEmpty(error) ? 0 : FS_EACH_IO_ERROR;
        }
        const size_t length = m_path.size();
        FSDirEntry entry;
        int result = 0;
        while ((result = FSReadDir(dir, entry)) > 0) {
            if (IsSkipped(entry.name)) continue;
            if (IsAborted()) {
                LogAbort();
                return FS_EACH_ABORTED;
            }
            m_path.append("/").append(entry.name);
            if (!IsIgnored(entry, m_path, m_visitor.prefix_length, m_visitor.filter)) Take(entry);
            m_path.resize(length);
        }
        return result == 0 && m_visitor.list->HasRoom() ? 0 : FS_EACH_IO_ERROR;
    }

    void Take(const FSDirEntry& entry) {
        Frame& top = m_frames.back();
        if (entry.type == FS_TYPE_FILE) {
            // A name that comes twice is left out, as the list is then right; one for which there
            // was no room is missed at the end of the folder.
            (void)m_visitor.list->AddFile(top.list_index, entry.name, entry.mtime, entry.size);
            SLOG_INFO("FileProcessor (%d): local list: add file '%s'\n", m_visitor.worker_id,
                      entry.name.c_str());
        } else if (entry.type == FS_TYPE_DIR) {
            const int index = m_visitor.list->AddDir(top.list_index, entry.name, entry.mtime);
            const bool is_told_later = m_recursive && (m_flags & FS_EACH_DIR_LAST) != 0;
            if (!is_told_later || index < 0) LogDir(m_visitor, entry.name, index);
            if (m_recursive && index >= 0) {
                top.sub_dirs.push_back({entry.name, index});
            }
        }
    }

    const FSVisitor& m_visitor;
    unsigned m_flags;
    const std::atomic<int>* m_abort_flag;
    bool m_recursive;
    std::string m_path;
    std::vector<Frame> m_frames;
};

}  // namespace

int FSForEachEntry(const std::string& path, const FSVisitor& visitor, unsigned flags,
                   const std::atomic<int>* abort_flag, bool recursive) {
    return Walk(visitor, flags, abort_flag, recursive).Run(path);
}
