// What the tests of FileDB share: an open database in a scratch folder, and short verbs.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "db/file-db.h"
#include "db/raw-database.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/file-list.h"

class FileDBTest : public testing::Test {
protected:
    FileDBTest() { EXPECT_EQ(0, m_db.Init(m_path)); }

    void Set(const std::string& source, const std::string& destination, uint64_t size = 1,
             uint32_t mtime = 1000) {
        EXPECT_EQ(0,
                  m_db.SetFileInfoBySourcePath({source, destination, FILE_INFO_FILE, size, mtime}));
    }
    void SetDir(const std::string& source) {
        EXPECT_EQ(0, m_db.SetFileInfoBySourcePath({source, source, FILE_INFO_DIR, 0, 0}));
    }
    // "source destination type size mtime", or "" without a row.
    std::string BySource(const std::string& path) {
        FileInfo info;
        const int found = m_db.GetFileInfoBySourcePath(path, info);
        EXPECT_LE(0, found);
        return found == 1 ? Text(info) : "";
    }
    std::string ByDestination(const std::string& path) {
        FileInfo info;
        const int found = m_db.GetFileInfoByDestinationPath(path, info);
        EXPECT_LE(0, found);
        return found == 1 ? Text(info) : "";
    }
    static std::string Text(const FileInfo& info) {
        return info.source_path + " " + info.destination_path + " " +
               std::to_string(info.file_type) + " " + std::to_string(info.size) + " " +
               std::to_string(info.mtime);
    }
    // The entries in the order of the list: a folder with "/" at its end, a file with
    // "=size@mtime".
    std::vector<std::string> List(const std::string& path, bool recursive = false) {
        NamePool pool;
        FileList list(pool);
        EXPECT_EQ(0, m_db.GetFileListBySourcePath(path, recursive, list));
        std::vector<std::string> entries;
        for (FileListIterator at = list.begin(); at != list.end(); ++at) {
            entries.push_back(at->is_dir ? at->path + "/"
                                         : at->path + "=" + std::to_string(at->size) + "@" +
                                               std::to_string(at->mtime));
        }
        return entries;
    }
    bool IsChanged(const std::string& src, const std::string& dst) {
        bool changed = false;
        EXPECT_EQ(0, m_db.DstPathFormatChanged(src, dst, changed));
        return changed;
    }
    uint64_t FreeNumber(const std::string& stem, const std::string& extension) {
        uint64_t number = 0;
        EXPECT_EQ(0, m_db.GetFreeNumber(stem, extension, number));
        return number;
    }
    // All source paths, sorted.
    std::string Sources() {
        return Raw("SELECT source_path FROM file_info_table ORDER BY source_path");
    }
    std::string Raw(const std::string& sql) { return RawDatabase(m_path).Read(sql); }
    void Reopen() {
        m_db.Close();
        ASSERT_EQ(0, m_db.Init(m_path));
    }
    // As after a flush of the destination.
    void ProveAll() {
        int64_t mark = 0;
        EXPECT_EQ(0, m_db.GetUnprovenMark(mark));
        EXPECT_EQ(0, m_db.ProveFileInfo(mark));
    }

    TempDir m_dir;
    const std::string m_path = m_dir / "file-db.sqlite";
    LogCapture m_log;
    FileDB m_db;
};
