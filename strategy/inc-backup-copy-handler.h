// The copy of a file of an incremental task: chooses a name that no other copy has, and records
// where the file went.
#pragma once

#include <set>
#include <string>
#include <string_view>

#include "strategy/copy-handler.h"

class FileDB;
struct FileInfo;

class IncBackupCopyHandler final : public CopyHandler {
protected:
    [[nodiscard]] int SetCopyToFullPath() override;
    [[nodiscard]] int UpdateDB() override;
    [[nodiscard]] int NoteMove() override;

private:
    // The extensions of photos and videos, in lower case.
    static const std::set<std::string_view> m_image_set;
    static const std::set<std::string_view> m_video_set;

    [[nodiscard]] static bool IsPhotoOrVideo(const std::string& extension);
    // The name that the options of the task give the file.
    [[nodiscard]] int GetRenamedDstEventPath(std::string& dst_ev_path) const;
    // The destination of the file: where its copy went before, or a name that is free.
    [[nodiscard]] int ChooseDstEventPath(FileDB& db, std::string& dst_ev_path);
    [[nodiscard]] int GetMappedDstEventPath(FileDB& db, std::string& dst_ev_path) const;
    // The same for a file with a row: it may be copied over as long as it is as it was copied.
    [[nodiscard]] int UseRecordedPath(FileDB& db, const FileInfo& info);
    // Whether what stands under a name that no row has may be copied over.
    [[nodiscard]] bool IsUnknownOverwritable(const std::string& dst_ev_path) const;
    // Whether it is a copy of ours that never reached the disk whole.
    [[nodiscard]] bool IsLeftover(const FSInfo& info) const;
    [[nodiscard]] int LogNoFileDB(int code) const;
};
