// Under which name a file lands: the options, the time of the file, names that are taken.
#include <cstdlib>
#include <fstream>
#include <sstream>

#include "inc-backup-fixture.h"
#include "strategy/inc-backup-path.h"
#include "utils/error-code.h"

namespace {

using testing::ElementsAre;

constexpr time_t MAY_6 = 1683356889;  // 2023-05-06 07:08:09 UTC

class IncBackupNameTest : public IncBackupFixture {
protected:
    // Where a file of this name and time lands.
    std::string Land(const std::string& path, time_t mtime) {
        WriteSrc(path, "bytes", mtime);
        EXPECT_EQ(0, HandleCopy(path));
        return Recorded(path);
    }
};

TEST_F(IncBackupNameTest, TheOptionsSayWhereAFileLands) {
    struct Case {
        bool keep, date_dir, rename;
        const char* lands;
    };
    const Case cases[] = {
        {true,  false, false, "/DCIM/IMG_0001.JPG"               },
        {true,  true,  false, "/DCIM/IMG_0001.JPG"               },
        {true,  false, true,  "/DCIM/IMG_0001.JPG"               },
        {true,  true,  true,  "/DCIM/IMG_0001.JPG"               },
        {false, true,  true,  "/2023-05-06/2023-05-06_070809.JPG"},
        {false, true,  false, "/2023-05-06/IMG_0001.JPG"         },
        {false, false, true,  "/2023-05-06_070809.JPG"           },
        {false, false, false, "/IMG_0001.JPG"                    },
    };
    for (const Case& c : cases) {
        SetNaming(c.keep, c.date_dir, c.rename);
        EXPECT_EQ(c.lands, Land("/DCIM/IMG_0001.JPG", MAY_6));
        EXPECT_TRUE(IsThere(Dst(c.lands))) << c.lands;
        EXPECT_EQ(MAY_6, MtimeOf(Dst(c.lands)));
        EXPECT_EQ(0, m_task.file_db->RemoveFileInfoBySourcePath("/"));
    }
    EXPECT_TRUE(m_log.Has("[INFO] Keep Source Folder Structure dst_ev_path = /DCIM/IMG_0001.JPG"));
    EXPECT_TRUE(m_log.Has("[INFO] IncBackup: GetDstFullPath = " + Dst("/IMG_0001.JPG")));
    EXPECT_TRUE(
        m_log.Has("[INFO] IncBackupCopyHandler: SetCopyToFullPath = " + Dst("/IMG_0001.JPG")));
    EXPECT_TRUE(
        m_log.Has("[INFO] Get mapped dst path src_ev_path = /DCIM/IMG_0001.JPG, "
                  "dst_ev_path = /IMG_0001.JPG"));
}

TEST_F(IncBackupNameTest, OnlyPhotosAndVideosAreRenamedAndKeepTheirSpelling) {
    SetNaming(false, false, true);
    EXPECT_EQ("/2023-05-06_070809.JpEg", Land("/a.JpEg", MAY_6));
    EXPECT_EQ("/2023-05-06_070810.dvr-ms", Land("/d/b.dvr-ms", MAY_6 + 1));
    EXPECT_EQ("/2023-05-06_070811.jpg", Land("/x.tar.jpg", MAY_6 + 2));
    for (const char* name : {"/notes.txt", "/jpg", "/.jpg", "/a.jpg.bak", "/a.", "/a.jpgx"}) {
        EXPECT_EQ(name, Land(std::string("/folder") + name, MAY_6)) << name;
    }
}

TEST_F(IncBackupNameTest, EveryExtensionOfTheTwoListsIsRenamed) {
    const std::string lists =
        "3fr ari arw bay bmp cap cgm cr2 crw dcr dcs djv djvu dng drf eip erf fff gif ico ief iff "
        "iiq ilbm jp2 jpe jpeg jpg k25 kdc lbm mac mef mng mos mrw nef nrw obm orf pbm pct pcx pef "
        "pgm pic pict png pnm pnt pntg ppm psd ptx pxn qti qtif r3d raf ras raw rgb rw2 rwl rwz "
        "sr2 srf srw svg tga tif tiff ufo wbmp x3f xbm xpm xwd "
        "3g2 3gp aaf amr ani asf asx avi dat dif divx dv dvr-ms f4v flv ifo m1v m2t m2ts m2v m4u "
        "m4v mkv mov movie mp4 mpe mpeg mpeg1 mpeg2 mpeg4 mpg mts mxf mxu ogm ogv qt qtx rec rm "
        "rmvb swf tp trp ts vob webm wmv wmv9 wmx xvid";
    SetNaming(false, false, true);
    std::istringstream words(lists);
    std::string extension;
    int count = 0;
    for (; words >> extension; ++count) {
        EXPECT_EQ("/2023-05-06_070809." + extension, Land("/f." + extension, MAY_6));
    }
    EXPECT_EQ(78 + 52, count);
}

TEST_F(IncBackupNameTest, DatesAreLocalTimeOnBothSidesOfSummerTime) {
    SetTimeZone("Europe/Berlin");
    SetNaming(false, true, true);
    // 2023-03-26: 01:59:59 winter time is followed by 03:00:00 summer time.
    EXPECT_EQ("/2023-03-26/2023-03-26_015959.jpg", Land("/1.jpg", 1679792399));
    EXPECT_EQ("/2023-03-26/2023-03-26_030000.jpg", Land("/2.jpg", 1679792400));
    // 2023-10-29: 02:59:59 summer time is followed by 02:00:00 winter time; the hour comes twice.
    EXPECT_EQ("/2023-10-29/2023-10-29_023000.jpg", Land("/3.jpg", 1698539400));
    EXPECT_EQ("/2023-10-29/2023-10-29_023000 (1).jpg", Land("/4.jpg", 1698543000));
    // The day is the local one.
    EXPECT_EQ("/2024-01-01/2024-01-01_003000.jpg", Land("/5.jpg", 1704065400));
    SetTimeZone("UTC");
    EXPECT_EQ("/2023-12-31/2023-12-31_233000.jpg", Land("/6.jpg", 1704065400));
}

TEST_F(IncBackupNameTest, AZoneThatIsChangedBetweenRunsIsTakenUp) {
    SetNaming(false, true, false);
    WriteSrc("/1.jpg", "bytes", 1704065400);  // half an hour before the year ends in London
    RunWell();
    EXPECT_EQ("/2023-12-31/1.jpg", Recorded("/1.jpg"));
    setenv("TZ", "JST-9", 1);  // and nobody tells the C library
    WriteSrc("/2.jpg", "bytes", 1704065400);
    RunWell();
    EXPECT_EQ("/2024-01-01/2.jpg", Recorded("/2.jpg"));
}

TEST_F(IncBackupNameTest, ATimeBefore1970HasItsDate) {
    SetNaming(false, true, false);
    EXPECT_EQ("/1969-12-31/a.jpg", Land("/a.jpg", -1));
}

TEST_F(IncBackupNameTest, TwoPhotosOfOneSecondGetTwoNames) {
    SetNaming(false, false, true);
    EXPECT_EQ("/2023-05-06_070809.JPG", Land("/a/1.JPG", MAY_6));
    EXPECT_EQ("/2023-05-06_070809 (1).JPG", Land("/b/1.JPG", MAY_6));
    EXPECT_EQ("/2023-05-06_070809 (2).JPG", Land("/c/1.JPG", MAY_6));
    EXPECT_EQ("/2023-05-06_070809.jpg", Land("/d/1.jpg", MAY_6)) << "another spelling";
}

TEST_F(IncBackupNameTest, ANameWithoutAnExtensionIsNumberedAtItsEnd) {
    SetNaming(false, false, false);
    EXPECT_EQ("/README", Land("/a/README", MAY_6));
    EXPECT_EQ("/README (1)", Land("/b/README", MAY_6));
    EXPECT_EQ("/.rc", Land("/a/.rc", MAY_6));
    EXPECT_EQ("/.rc (1)", Land("/b/.rc", MAY_6));
}

TEST_F(IncBackupNameTest, AChangedFileKeepsItsNumberedName) {
    SetNaming(false, false, false);
    Land("/a/1.txt", MAY_6);
    EXPECT_EQ("/1 (1).txt", Land("/b/1.txt", MAY_6));
    EXPECT_EQ("/1 (1).txt", Land("/b/1.txt", MAY_6 + 5));
    EXPECT_TRUE(
        m_log.Has("[INFO] Dst path foramt NOT changed, src_ev_path = /b/1.txt, "
                  "dst_ev_path = /1 (1).txt"));
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/1 (1).txt=bytes", "/1.txt=bytes"));
}

TEST_F(IncBackupNameTest, AChangedFileUnderNewOptionsGetsANewNameAndTheOldCopyStays) {
    SetNaming(true, false, false);
    EXPECT_EQ("/a/1.jpg", Land("/a/1.jpg", MAY_6));
    SetNaming(false, true, false);
    EXPECT_EQ("/2023-05-06/1.jpg", Land("/a/1.jpg", MAY_6 + 5));
    EXPECT_THAT(NamesOf(Dst()),
                ElementsAre("/2023-05-06/", "/2023-05-06/1.jpg=bytes", "/a/", "/a/1.jpg=bytes"));
}

TEST_F(IncBackupNameTest, PathsOfEventsAndFullPathsLeadIntoEachOther) {
    EXPECT_EQ(Dst(), IncBackupGetDstFullPath(m_task, "/"));
    EXPECT_EQ(Dst("/a/b"), IncBackupGetDstFullPath(m_task, "/a/b"));
    EXPECT_EQ("/", IncBackupGetDstEventPath(m_task, Dst()));
    EXPECT_EQ("/a/b", IncBackupGetDstEventPath(m_task, Dst("/a/b")));
    EXPECT_EQ("", IncBackupGetDstEventPath(m_task, "/elsewhere"));
    EXPECT_EQ("", IncBackupGetDstEventPath(m_task, ""));
    EXPECT_EQ("/x" + Dst("/y"), IncBackupGetDstEventPath(m_task, Dst("/x") + Dst("/y")))
        << "the first place counts";
}

}  // namespace
