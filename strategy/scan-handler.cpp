#include "strategy/scan-handler.h"

#include "event/event-generator.h"
#include "strategy/file-event-context.h"
#include "strategy/root-check.h"
#include "utils/error-code.h"
#include "utils/file-list.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

// As the lists are ordered: byte by byte; of two paths that begin alike the longer is the greater.
int ComparePaths(const std::string& left, const std::string& right) { return left.compare(right); }

// The outcome of a listing that broke off: a folder that cannot be read because its device is gone
// shall not be tried again and again.
int ListingFailure(const TaskRunInfo& task, int result) {
    const int gone = result == ERR_IO ? CheckTaskRoots(task) : ERR_SUCCESS;
    return gone < 0 ? gone : result;
}

}  // namespace

int ScanHandler::Handle() {
    const char* path = Context().src_full_path.c_str();
    NamePool pool;
    FileList src_list(pool);
    FileList dst_list(pool);
    if (const int result = GetSrcList(src_list); result < 0) {
        SLOG_ERR("ScanHandler: Failed to get src list '%s'", path);
        return ListingFailure(Task(), result);
    }
    if (const int result = GetDstList(dst_list); result < 0) {
        SLOG_ERR("ScanHandler: Failed to get dst list '%s'", path);
        return ListingFailure(Task(), result);
    }
    // After the listings: a folder that was listed while its device was still there is true.
    if (const int result = CheckTaskRoots(Task()); result < 0) return result;
    if (const int result = GenerateEvent(src_list, dst_list); result < 0) {
        SLOG_ERR("ScanHandler: Failed to generate event for '%s'", path);
        return result;
    }
    return ERR_SUCCESS;
}

int ScanHandler::GetSrcList(FileList& list) {
    const std::string& path = Context().src_full_path;
    SLOG_INFO("ScanHandler: get src file list path '%s', [task: %llu]", path.c_str(),
              Llu(Task().task_id));
    const int result = ListFolder(path, list);
    if (result < 0) SLOG_ERR("interrupted while get src file list '%s'", path.c_str());
    return result;
}

int ScanHandler::ListFolder(const std::string& path, FileList& list) {
    const std::shared_ptr<FileFilter> filter = Task().system_filter;
    FSVisitor visitor;
    visitor.list = &list;
    visitor.dir_index = FileList::ROOT;
    visitor.prefix_length = path.size();
    visitor.worker_id = ProcessorId();
    visitor.filter = filter.get();
    const int result = FSForEachEntry(path, visitor, FS_EACH_STAT, AbortFlag(), false);
    if (result >= 0) return ERR_SUCCESS;
    return result == FS_EACH_ABORTED ? ERR_INTERRUPTED : ERR_IO;
}

int ScanHandler::GetDstList(FileList& /*list*/) { return ERR_SUCCESS; }

bool ScanHandler::IsUnproven(const FileListEntry& /*dst*/) { return false; }

SpellingPairs ScanHandler::FindSpellingPairs(const FileList& /*src_list*/,
                                             const FileList& /*dst_list*/) {
    return {};
}

int ScanHandler::GenerateEvent(const FileList& src_list, const FileList& dst_list) {
    const SpellingPairs pairs = FindSpellingPairs(src_list, dst_list);
    FileListIterator src = src_list.begin();
    FileListIterator dst = dst_list.begin();
    const FileListIterator src_end = src_list.end();
    const FileListIterator dst_end = dst_list.end();
    while (true) {
        const bool has_src = src != src_end;
        const bool has_dst = dst != dst_end;
        if (!has_src && !has_dst) return ERR_SUCCESS;
        if (IsAborted()) {
            SLOG_WARN("GenerateEvent: user stopped");
            return ERR_INTERRUPTED;
        }
        const int order = !has_dst ? 1 : !has_src ? -1 : ComparePaths(src->path, dst->path);
        if (order > 0) {
            const FileListEntry* other_half = pairs.OtherHalf(src->path);
            other_half != nullptr ? IssuePair(*src, *other_half) : IssueCopy(*src);
        } else if (order < 0) {
            if (!pairs.HasDst(dst->path)) IssueRemove(*dst);
        } else {
            IssuePair(*src, *dst);
        }
        if (order >= 0) src.next();
        if (order <= 0) dst.next();
    }
}

void ScanHandler::IssuePair(const FileListEntry& src, const FileListEntry& dst) {
    if (src.is_dir && dst.is_dir) {
        SLOG_INFO("GenerateEvent: both dir '%s', issue scan", src.path.c_str());
        IssueScan(src);
    } else if (src.is_dir != dst.is_dir) {
        SLOG_WARN("GenerateEvent: type change src(%s, %d), dst(%s, %d)", src.path.c_str(),
                  src.is_dir, dst.path.c_str(), dst.is_dir);
        IssueModify(src, dst);
    } else if (src.size != dst.size || src.mtime != dst.mtime) {
        SLOG_INFO("GenerateEvent: file modify src(%llu, %u), dst(%llu, %u)", Llu(src.size),
                  src.mtime, Llu(dst.size), dst.mtime);
        IssueModify(src, dst);
    } else if (IsUnproven(dst)) {
        // Copied before, but maybe never written to the disk. It is our own copy: written anew in
        // its place, it has no business in the recycle bin.
        SLOG_NOTICE(
            "GenerateEvent: both file '%s', size and mtime are equal, not proven, copy again",
            src.path.c_str());
        IssueCopy(src);
    } else {
        SLOG_INFO("GenerateEvent: both file '%s', size and mtime are equal, skipping",
                  src.path.c_str());
    }
}

void ScanHandler::IssueCopy(const FileListEntry& entry) {
    SLOG_INFO("IssueCopy: %s, %d", entry.path.c_str(), entry.is_dir);
    const EventGenerator generator(Task().task_id);
    const std::string path = JoinEntryPath(entry.path);
    if (entry.is_dir) {
        generator.PushCreateDirEvent(path);
        generator.PushScanEvent(path);
    } else {
        generator.PushCopyFileEvent(path);
    }
}

void ScanHandler::IssueScan(const FileListEntry& entry) {
    SLOG_INFO("IssueScan: %s, %d", entry.path.c_str(), entry.is_dir);
    if (!entry.is_dir) {
        SLOG_WARN("IssueScan: current event '%s' is not dir, skipping", entry.path.c_str());
        return;
    }
    EventGenerator(Task().task_id).PushScanEvent(JoinEntryPath(entry.path));
}

std::string ScanHandler::JoinEntryPath(const std::string& entry_path) const {
    const std::string& folder = EventPath();
    if (folder.empty() || folder == "/") return entry_path;
    return entry_path == "/" ? folder : folder + entry_path;
}
