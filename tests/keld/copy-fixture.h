// What the tests of copying and recycling share: two shares in a scratch folder, and files in them.
#pragma once

#include <gtest/gtest.h>
#include <keld/copy.h>
#include <keld/error.h>
#include <sys/stat.h>

#include <cstdint>
#include <string>
#include <vector>

#include "host/host-paths.h"
#include "support/temp-dir.h"

// Makes the folders the shares of this machine for as long as it lives, whatever its own
// configuration says.
class TestShares {
public:
    // `settings` are further lines for each share.
    explicit TestShares(const std::vector<std::string>& folders, const std::string& settings = "") {
        std::string text;
        for (const std::string& folder : folders) {
            text += "[share " + folder.substr(folder.rfind('/') + 1) + "]\npath = " + folder +
                    "\n" + settings;
        }
        keld_host::HostPaths paths;
        paths.hostConf = m_folder.Write("host.conf", text);
        keld_host::SetPaths(paths);
    }
    ~TestShares() { keld_host::SetPaths({}); }
    TestShares(const TestShares&) = delete;
    TestShares& operator=(const TestShares&) = delete;

private:
    TempDir m_folder;
};

// The sorted names in a folder.
std::vector<std::string> NamesIn(const std::string& folder);
// Bytes without a pattern that a shifted block could hide in.
std::string TestBytes(size_t size, unsigned seed = 1);
// lstat; fails the running test when there is no such file.
struct stat StatOf(const std::string& path);
bool Exists(const std::string& path);

// Options as the daemon gives them, with the owner left alone.
inline KELDCopyOptions CopyOptions(int overwrite) {
    return {overwrite, 0, 1, 0, 1, 0, 0, 0, -1, -1, 0};
}
// One copy; KELDERR_SUCCESS or the error that it left.
int CopyOnce(const std::string& from, const std::string& to, int overwrite = 1);

// A copy whose callback is a function of the test: called with the number of the question, from 1.
template <typename Question>
int CopyAsking(const std::string& from, const std::string& to, Question question,
               int overwrite = 1) {
    struct State {
        Question question;
        int count = 0;
    } state{question};
    KELDCopyTHRArgs* args = KELDCopyTHRArgsAlloc();
    const auto callback = [](void* data) {
        auto* asked = static_cast<State*>(data);
        return asked->question(++asked->count) ? 1 : 0;
    };
    EXPECT_EQ(0, KELDCopyTHRSetCallbackIsCancel(args, callback, &state));
    const KELDCopyOptions options = CopyOptions(overwrite);
    const int result = KELDFileCopy_r(from.c_str(), to.c_str(), &options, args);
    const int code = result == 0 ? int{KELDERR_SUCCESS} : KLIBCErrGet();
    KELDCopyTHRArgsFree(args);
    return code;
}
