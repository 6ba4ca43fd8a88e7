#include "platform/keld-copy.h"

#include <keld/copy.h>
#include <keld/error.h>

#include <memory>

#include "utils/unique-fd.h"

namespace {

using UniqueCopyArgs = std::unique_ptr<KELDCopyTHRArgs, FreeWith<KELDCopyTHRArgsFree>>;

}  // namespace

KeldCopyResult KeldCopyFile(const std::string& from, const std::string& to, int overwrite,
                            int owner, int group, int (*is_cancel)(void*), void* user_data) {
    const UniqueCopyArgs args(KELDCopyTHRArgsAlloc());
    if (!args) return {KELD_COPY_NO_ARGS, 0};
    if (KELDCopyTHRSetCallbackIsCancel(args.get(), is_cancel, user_data) < 0) {
        return {KELD_COPY_NO_CALLBACK, 0};
    }
    KELDCopyOptions options{};
    options.overwrite = overwrite;
    options.word2 = 1;
    options.word4 = 1;
    options.owner = owner;
    options.group = group;
    if (KELDFileCopy_r(from.c_str(), to.c_str(), &options, args.get()) == 0) return {};
    return {KELD_COPY_FAILED, KLIBCErrGet()};
}
