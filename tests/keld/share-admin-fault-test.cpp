// What is left when a step of a change fails, or the program is killed in its middle.
#include <signal.h>
#include <sys/resource.h>

#include <cerrno>

#include "admin-faults.h"
#include "host/share-folder.h"
#include "share-admin-fixture.h"
#include "support/kill-at-call.h"
#include "support/log-capture.h"

using keld_host::AddShare;
using keld_host::RemoveShare;
using keld_host::RenameShare;

namespace {

// No file can be written while it lives; names can be changed.
class NoRoomForFiles {
public:
    NoRoomForFiles() {
        m_handler = signal(SIGXFSZ, SIG_IGN);
        getrlimit(RLIMIT_FSIZE, &m_limit);
        const rlimit none{0, m_limit.rlim_max};
        setrlimit(RLIMIT_FSIZE, &none);
    }
    ~NoRoomForFiles() {
        setrlimit(RLIMIT_FSIZE, &m_limit);
        signal(SIGXFSZ, m_handler);
    }
    NoRoomForFiles(const NoRoomForFiles&) = delete;
    NoRoomForFiles& operator=(const NoRoomForFiles&) = delete;

private:
    rlimit m_limit{};
    sighandler_t m_handler;
};

class ShareAdminFaults : public ShareAdmin {
protected:
    void ExpectAllAsBefore(const std::string& what) const {
        EXPECT_EQ(TWO_SECTIONS, ShortConf()) << what;
        EXPECT_EQ("picture", ReadWholeFile(At("volume1/photos/img"))) << what;
        EXPECT_FALSE(Exists("volume1/pictures")) << what;
        EXPECT_FALSE(Exists("volume1/films")) << what;
        EXPECT_EQ((Texts{"music=/volume1/music", "photos=/volume1/photos"}), Shares()) << what;
    }
    Outcome WithoutRoom(const std::function<Outcome()>& change) {
        const NoRoomForFiles guard;
        return change();
    }
};

}  // namespace

TEST_F(ShareAdminFaults, WhenHostConfCannotBeWrittenTheFolderIsTakenBack) {
    MakeTwoSections();
    ExpectRefused(WithoutRoom([] { return RenameShare("photos", "pictures"); }),
                  "host.conf cannot be changed: File too large");
    ExpectAllAsBefore("rename");
    ExpectRefused(WithoutRoom([] { return AddShare("films"); }), "host.conf cannot be changed");
    ExpectAllAsBefore("add");
    ExpectRefused(WithoutRoom([] { return RemoveShare("photos"); }), "host.conf cannot be changed");
    ExpectAllAsBefore("remove");
}

TEST_F(ShareAdminFaults, AFolderThatWasThereStaysWhenHostConfCannotBeWritten) {
    MakeTwoSections();
    m_dir.MakeDir("volume1/films");
    ExpectRefused(WithoutRoom([] { return AddShare("films"); }), "cannot be changed");
    EXPECT_TRUE(Exists("volume1/films"));
}

TEST_F(ShareAdminFaults, WhenTakingBackFailsTooTheSentenceSaysWhatToDo) {
    MakeTwoSections();
    const FailNth fault(FailNth::RENAME_WITH_FLAGS, 2, 2, EIO);
    const Outcome outcome = WithoutRoom([] { return RenameShare("photos", "pictures"); });
    ExpectRefused(outcome, "rename it to " + At("volume1/photos") + " by hand");
    EXPECT_TRUE(FailNth::HasFailed());
    EXPECT_EQ("picture", ReadWholeFile(At("volume1/pictures/img")));
    EXPECT_EQ(TWO_SECTIONS, ShortConf());
}

TEST_F(ShareAdminFaults, ARenameThatFailsChangesNothing) {
    MakeTwoSections();
    for (const int error : {EXDEV, EBUSY, EIO, EEXIST, EROFS}) {
        const FailNth fault(FailNth::RENAME_WITH_FLAGS, 1, 1, error);
        ExpectRefused(RenameShare("photos", "pictures"), "cannot be renamed: ");
        EXPECT_TRUE(FailNth::HasFailed());
        ExpectAllAsBefore(std::to_string(error));
    }
}

TEST_F(ShareAdminFaults, AFileSystemWithoutFlagsOfARenameServesToo) {
    MakeTwoSections();
    const FailNth fault(FailNth::RENAME_WITH_FLAGS, 1, 100, EINVAL);
    ExpectDone(RenameShare("photos", "pictures"), "volume1/pictures");
    EXPECT_TRUE(FailNth::HasFailed());
    EXPECT_EQ("picture", ReadWholeFile(At("volume1/pictures/img")));
    ExpectRefused(WithoutRoom([] { return RenameShare("pictures", "photos"); }),
                  "host.conf cannot be changed");
    EXPECT_EQ("picture", ReadWholeFile(At("volume1/pictures/img")));
    EXPECT_FALSE(Exists("volume1/photos"));
}

// Whoever makes a folder of that name in the last moment keeps it.
TEST_F(ShareAdminFaults, AFolderIsNotRenamedOverAnEmptyOne) {
    m_dir.Write("volume1/photos/img", "picture");
    m_dir.MakeDir("volume1/empty");
    for (const int last : {0, 1}) {  // with the flags of a rename, and without
        const FailNth fault(FailNth::RENAME_WITH_FLAGS, 1, last, EINVAL);
        EXPECT_EQ(EEXIST, keld_host::RenameShareFolder(At("volume1/photos"), At("volume1/empty")));
        EXPECT_EQ("picture", ReadWholeFile(At("volume1/photos/img")));
        EXPECT_TRUE(Exists("volume1/empty"));
    }
}

TEST_F(ShareAdminFaults, AFolderThatIsRemovedButNotFlushedIsToldAsThat) {
    m_dir.MakeDir("volume1/photos");
    const FailNth fault(FailNth::FLUSH, 1, 1, EIO);
    ExpectRefused(RemoveShare("photos"), "is removed, but the disk has not confirmed it");
    EXPECT_FALSE(Exists("volume1/photos"));
}

// A flush that fails leaves the old state, also when the new file stood in its place already.
TEST_F(ShareAdminFaults, WhicheverFlushFailsNothingIsChanged) {
    MakeTwoSections();
    const std::pair<const char*, std::function<Outcome()>> changes[] = {
        {"rename", [] { return RenameShare("photos", "pictures"); }},
        {"add",    [] { return AddShare("films"); }                },
        {"remove", [] { return RemoveShare("photos"); }            },
    };
    for (const auto& [what, change] : changes) {
        int failures = 0;
        for (int nth = 1;; ++nth) {
            const FailNth fault(FailNth::FLUSH, nth, nth, EIO);
            const Outcome outcome = change();
            if (!FailNth::HasFailed()) break;
            ++failures;
            ExpectRefused(outcome, "Input/output error");
            ExpectAllAsBefore(what + std::to_string(nth));
        }
        EXPECT_LE(2, failures) << what << ": of the new file and of its name";
        Conf(TWO_SECTIONS);  // what the last round has done is undone
        std::filesystem::remove(At("volume1/films"));
        if (Exists("volume1/pictures")) {
            std::filesystem::rename(At("volume1/pictures"), At("volume1/photos"));
        }
    }
}

TEST_F(ShareAdminFaults, ARenameKilledAnywhereLeavesTheFilesAndAWholeHostConf) {
    int killed = 0;
    for (int nth = 1;; ++nth) {
        std::filesystem::remove_all(At("volume1"));
        MakeTwoSections();
        const KillResult result =
            KillAtCall(nth, [] { return RenameShare("photos", "pictures").IsDone() ? 0 : 1; });
        if (result == KillResult::CANNOT_TRACE) GTEST_SKIP() << "programs cannot be traced here";
        const bool isMoved = Exists("volume1/pictures");
        const bool isNamed = ConfText().find("volume1/pictures") != std::string::npos;
        EXPECT_NE(isMoved, Exists("volume1/photos")) << nth;
        EXPECT_EQ("picture",
                  ReadWholeFile(At(isMoved ? "volume1/pictures/img" : "volume1/photos/img")));
        EXPECT_TRUE(isMoved || !isNamed) << nth << ": host.conf follows the folder";
        EXPECT_TRUE(isNamed || ShortConf() == TWO_SECTIONS) << nth << ShortConf();
        // Nothing that the dead program held stands in the way of the next one.
        ExpectDone(RenameShare("music", "noise"), "volume1/noise");
        ASSERT_NE(KillResult::FAILED, result) << nth;
        if (result == KillResult::DONE) {
            EXPECT_TRUE(isMoved && isNamed);
            break;
        }
        ++killed;
    }
    EXPECT_LE(5, killed) << "the lock, the folder, the new file, its flush, its name";
}
