// The memory of an incremental task: for each entry of the source where its copy went, and which
// size and time it had. The next run compares the source with these rows and not with the
// destination, so that a copy may be moved, renamed or removed there and still counts as done.
//
// A row says "I have this file", and must never outlive the file. So each row of a file that is new
// or changed, or of a folder that was made, is unproven at first: triggers in the file note it in
// the same transaction. Once the destination has been flushed, ProveFileInfo() strikes the note
// out; opening the database removes the rows that are still noted, because nobody knows what became
// of their files.
//
// Threads: every operation may be called from any thread; one mutex is held for a whole operation.
// Results: 0 or -1; reads of one row give 1 (found, the record is filled), 0 (no such row, the
// record is untouched) or -1. Failures are logged. While closed, all give -1. A file locked by
// another process is waited for, up to five minutes.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "db/db-mutex.h"
#include "db/file-info.h"

class FileList;
struct FileDBState;

class FileDB {
public:
    FileDB();
    ~FileDB();
    FileDB(const FileDB&) = delete;
    FileDB& operator=(const FileDB&) = delete;

    // Opens the file, made with mode 0600 if it is missing, and forgets what is unproven. Open
    // already: 0, and the first file stays. A file of the older form is used as it is. After a
    // failure the object is closed as before, and the rows of the file are as they were.
    [[nodiscard]] int Init(const std::string& path);
    // May be called at any time; Init() may follow.
    void Close();

    // Adds the row, or changes the one of this source path in place.
    [[nodiscard]] int SetFileInfoBySourcePath(const FileInfo& info);
    // The same in one transaction with the rows before and after it, which costs a fraction. Other
    // programs see it at the latest with the next proof; a crash loses it, as it loses all rows
    // that are unproven. A failure loses the rows of the transaction, here or where it ends.
    [[nodiscard]] int SetFileInfoInBatch(const FileInfo& info);
    // Ends the transaction, before what may take long: while it is open nobody else can write.
    [[nodiscard]] int EndBatch();
    [[nodiscard]] int GetFileInfoBySourcePath(const std::string& path, FileInfo& info);
    [[nodiscard]] int GetFileInfoByDestinationPath(const std::string& path, FileInfo& info);
    // Removes the row and all rows below it. -1 for an empty path.
    [[nodiscard]] int RemoveFileInfoBySourcePath(const std::string& path);
    // Adds what the folder `path` holds to the list, by paths relative to it: its entries, or with
    // `recursive` all that lies below. The cost is that of the rows listed, for one level as well.
    [[nodiscard]] int GetFileListBySourcePath(const std::string& path, bool recursive,
                                              FileList& list);
    // `changed` is false exactly when there is a row for `src`, and its copy went to `dst` or to a
    // " (n)" variant of it.
    [[nodiscard]] int DstPathFormatChanged(const std::string& src, const std::string& dst,
                                           bool& changed);
    // The text as a pattern of GLOB that matches just this text.
    [[nodiscard]] static std::string EscapeGlob(const std::string& text);

    // --- Names at the destination

    // Notes where a file went that leaves no row because its source goes, and removes the row that
    // it had: no other file may take that name until ForgetMovedFiles(). On the disk when it
    // returns 0: the source may be removed. A name is noted once, the last note holds.
    [[nodiscard]] int AddMovedFile(const FileInfo& info);
    // Fills in the destination that was noted for this source path, size and time.
    [[nodiscard]] int GetMovedFile(FileInfo& info);
    [[nodiscard]] int ForgetMovedFiles();
    // 1 when a row has this destination or a moved file went there; 0, -1.
    [[nodiscard]] int IsDestinationTaken(const std::string& path);
    // The lowest n from 1 on for which "stem (n)", with "." and the extension if there is one, is
    // not taken. Asked again and again for one name, each answer costs about the same.
    [[nodiscard]] int GetFreeNumber(const std::string& stem, const std::string& extension,
                                    uint64_t& number);
    // "stem (number)", with "." and the extension if there is one.
    [[nodiscard]] static std::string NumberedPath(const std::string& stem,
                                                  const std::string& extension, uint64_t number);
    // Whether `path` is `wanted`, or a " (n)" variant of it.
    [[nodiscard]] static bool IsVariant(const std::string& path, const std::string& wanted);

    // --- Proof

    // The row is unproven until it is written again, whatever is proven, and that is on the disk:
    // its file is about to be replaced. No such row is no failure.
    [[nodiscard]] int DoubtFileInfo(const std::string& source_path);
    // Taken before a flush, given to ProveFileInfo() after it: what is written between the two
    // stays unproven. 0 when nothing is unproven.
    [[nodiscard]] int GetUnprovenMark(int64_t& mark);
    [[nodiscard]] int ProveFileInfo(int64_t mark);
    // The flush failed: all rows that are unproven go. When that fails it is done before any row is
    // listed or proven, which fails until then.
    [[nodiscard]] int ForgetUnproven();
    // Whether that was called since the last time one asked.
    [[nodiscard]] bool TakeFlushFailure();
    // Whether rows were lost with a batch since the last time one asked.
    [[nodiscard]] bool TakeRowLoss();
    // How many files were recorded since the last mark that was proven, and since how many seconds
    // the first of them waits.
    [[nodiscard]] uint64_t UnprovenCount();
    [[nodiscard]] int64_t UnprovenSeconds();

private:
    DbMutex m_mutex;
    std::unique_ptr<FileDBState> m_state;  // guarded by m_mutex; null while closed
};
