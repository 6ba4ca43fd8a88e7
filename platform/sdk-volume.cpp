#include "platform/sdk-volume.h"

#include <keld/error.h>
#include <keld/volume.h>

#include <memory>

#include "platform/sdk-mutex.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace SDK {
namespace {

using UniqueVolumes = std::unique_ptr<KELDMountVolInfo, FreeWith<KELDMountVolInfoFree>>;

Volume FromRecord(const KELDMountVolInfo& record) {
    return {record.mount_path, record.is_mounted != 0, record.is_writable != 0,
            record.is_internal != 0};
}

}  // namespace

int ListVolumes(std::vector<Volume>& volumes) {
    volumes.clear();
    const ReentrantLock lock;
    const UniqueVolumes list(KELDMountVolAllEnum(0, 0));
    if (!list && KLIBCErrGet() != KELDERR_SUCCESS) {
        SLOG_ERR("KELDMountVolAllEnum() failed[0x%04X %s:%d]\n",
                 static_cast<unsigned>(KLIBCErrGet()), KLIBCErrorGetFile(), KLIBCErrorGetLine());
        return -1;
    }
    for (const KELDMountVolInfo* record = list.get(); record != nullptr; record = record->next) {
        volumes.push_back(FromRecord(*record));
    }
    return 0;
}

bool GetVolume(const std::string& path, Volume& volume) {
    const ReentrantLock lock;
    const UniqueVolumes record(KELDMountVolInfoGet(path.c_str()));
    if (record) volume = FromRecord(*record);
    return record != nullptr;
}

}  // namespace SDK
