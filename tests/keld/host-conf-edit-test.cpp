#include "host/host-conf-edit.h"

#include <gtest/gtest.h>

#include "host/host-conf.h"

using keld_host::HasShareSection;
using keld_host::HostConf;
using keld_host::HostConfError;
using keld_host::ParseHostConf;
using keld_host::WithShareAdded;
using keld_host::WithShareMoved;
using keld_host::WithShareRemoved;

namespace {

constexpr const char* NOTHING = "(refused)";

// What a change came to.
std::string Text(const std::optional<std::string>& changed) { return changed.value_or(NOTHING); }

const std::string CONF =
    "; The box in the cellar.\n"
    "[volume /volume1]\n"
    "internal=yes\n"
    "\n"
    "# Pictures of everybody\n"
    "[share photos]   ; since 2019\n"
    "  path = /volume1/photos  ; do not move\n"
    "; the bin is emptied by hand\n"
    "recycle_bin = yes\n"
    "; old: mount_point = yes\n"
    "\n"
    "; Music\n"
    "[share music]\n"
    "path: /volume1//music/\n"
    "\n"
    "[removable]\n"
    "devices = /dev/loop*\n";

std::string Replaced(std::string text, const std::string& what, const std::string& with) {
    const size_t at = text.find(what);
    EXPECT_NE(std::string::npos, at) << what;
    return text.replace(at, what.size(), with);
}

}  // namespace

TEST(HostConfEdit, AddingPutsASectionAtTheEndAndChangesNothingElse) {
    EXPECT_EQ(CONF + "\n[share films]\npath = /volume1/films\n",
              Text(WithShareAdded(CONF, "/volume1/films")));
    EXPECT_EQ("[share a]\npath = /volume1/a\n", Text(WithShareAdded("", "/volume1/a")));
}

TEST(HostConfEdit, AddingEndsALastLineThatHasNoEnd) {
    EXPECT_EQ("[share a]\npath = /v/a\n\n[share b]\npath = /v/b\n",
              Text(WithShareAdded("[share a]\npath = /v/a", "/v/b")));
}

TEST(HostConfEdit, AFileFromWindowsKeepsItsLineEnds) {
    const std::string text = "\xEF\xBB\xBF[share a]\r\npath = /v/a\r\n";
    EXPECT_EQ(text + "\r\n[share b]\r\npath = /v/b\r\n", Text(WithShareAdded(text, "/v/b")));
    EXPECT_EQ("\xEF\xBB\xBF[share c]\r\npath = /v/c\r\n",
              Text(WithShareMoved(text, "/v/a", "/v/c")));
}

TEST(HostConfEdit, RenamingChangesHeaderAndPathAndKeepsWhatStandsBesideThem) {
    const std::string expected =
        Replaced(Replaced(CONF, "[share photos]", "[share new pictures, 100%]"),
                 "= /volume1/photos  ;", "= /volume1/new pictures, 100%  ;");
    EXPECT_EQ(expected,
              Text(WithShareMoved(CONF, "/volume1/photos", "/volume1/new pictures, 100%")));
    EXPECT_EQ(
        Replaced(Replaced(CONF, "[share music]", "[share m]"), "/volume1//music/", "/volume1/m"),
        Text(WithShareMoved(CONF, "/volume1/music", "/volume1/m")));
}

TEST(HostConfEdit, AHeaderOfAnotherNameFollowsTheFolderToo) {
    EXPECT_EQ("[share new]\npath = /v/new\n",
              Text(WithShareMoved("[share Family]\npath = /v/old\n", "/v/old", "/v/new")));
}

TEST(HostConfEdit, RemovingTakesTheSectionFromItsHeaderToItsLastKey) {
    const std::string section =
        CONF.substr(CONF.find("[share photos]"), CONF.find("; old:") - CONF.find("[share photos]"));
    EXPECT_EQ(Replaced(CONF, section, ""), Text(WithShareRemoved(CONF, "/volume1/photos")))
        << "the comments around it stay";
}

TEST(HostConfEdit, RemovingLeavesOneBlankLineWhereThereWereTwo) {
    EXPECT_EQ("[share a]\npath = /v/a\n\n[share c]\npath = /v/c\n",
              Text(WithShareRemoved("[share a]\npath = /v/a\n\n[share b]\npath = /v/b\n\n"
                                    "[share c]\npath = /v/c\n",
                                    "/v/b")));
    EXPECT_EQ("[share b]\npath = /v/b\n",
              Text(WithShareRemoved("[share a]\npath = /v/a\n\n[share b]\npath = /v/b\n", "/v/a")));
}

TEST(HostConfEdit, RemovingWhatWasAddedGivesTheFileBack) {
    for (const std::string& text : {CONF, std::string("[share a]\npath = /v/a\n"), std::string()}) {
        const std::string added = Text(WithShareAdded(text, "/volume1/x"));
        EXPECT_EQ(text, Text(WithShareRemoved(added, "/volume1/x")));
    }
}

TEST(HostConfEdit, AShareThatIsNotThereCannotBeChanged) {
    EXPECT_EQ(NOTHING, Text(WithShareRemoved(CONF, "/volume1/none")));
    EXPECT_EQ(NOTHING, Text(WithShareMoved(CONF, "/volume1/none", "/volume1/b")));
    EXPECT_EQ(NOTHING, Text(WithShareRemoved("", "/volume1/none")));
}

TEST(HostConfEdit, AChangeThatWouldBreakTheFileIsNone) {
    EXPECT_EQ(NOTHING, Text(WithShareMoved(CONF, "/volume1/photos", "/volume1/music")));
    EXPECT_EQ(NOTHING, Text(WithShareAdded(CONF, "/volume2/photos"))) << "two of one name";
    EXPECT_EQ(NOTHING, Text(WithShareAdded("[share films]\npath = /v/other\n", "/v/films")))
        << "two headers of one name";
    EXPECT_EQ(NOTHING, Text(WithShareAdded("nonsense", "/v/films"))) << "broken before";
}

TEST(HostConfEdit, ASectionIsFoundByItsHeader) {
    EXPECT_TRUE(HasShareSection(CONF, "photos"));
    EXPECT_FALSE(HasShareSection(CONF, "/volume1"));
    EXPECT_FALSE(HasShareSection(CONF, "photo"));
    EXPECT_TRUE(HasShareSection("[share  a b ]\npath = /v/x\n", "a b"));
}

// Whatever a name holds, the file is read back with that name, or is not changed.
TEST(HostConfEdit, HostileNamesAreHeldOrRefused) {
    struct Case {
        std::string name;
        bool isHeld;
    };
    const Case cases[] = {
        {"plain",         true},
        {"two  blanks",   true},
        {"=",             true},
        {"a = b",         true},
        {"path",          true},
        {"a:b",           true},
        {"[x",            true},
        {"#hash",         true},
        {"\"quoted\"",    true},
        {"\\n",           true},
        {"100%s%n",       true},
        {"\xFF\xFE",      true},
        {"\u202Egpj",     true},
        {std::string(255, 'n'), true},
        {std::string(255,               ' ') + "x",     false},
        {"",          false         },
        {" x", false},
        {"x ",          false                  },
        {"a]b", false},
        {"a ; b",          false                           },
        {"a;b", true},
        {"a\nb",           false                                     },
        {"a\n[share evil]\npath = /etc",false},
        {"a\rb",           false                                                },
        {"a\tb",true},
        {std::string("a\0b",            3),                                                             false},
        {"\x01"
         "0",  false},
        {"..",    false },
        {"x/../../etc",            false       },
    };
    for (const Case& item : cases) {
        const std::string path = "/volume1/" + item.name;
        HostConf conf;
        HostConfError error;
        const auto added = WithShareAdded(CONF, path);
        EXPECT_EQ(item.isHeld, added.has_value()) << item.name;
        if (added) {
            ASSERT_TRUE(ParseHostConf(*added, conf, error)) << item.name << error.reason;
            EXPECT_EQ(path, conf.shares.back().path);
            EXPECT_TRUE(HasShareSection(*added, item.name));
        }
        const auto moved = WithShareMoved(CONF, "/volume1/music", path);
        EXPECT_EQ(item.isHeld, moved.has_value()) << item.name;
        if (moved) {
            ASSERT_TRUE(ParseHostConf(*moved, conf, error)) << item.name << error.reason;
            EXPECT_EQ(path, conf.shares.back().path);
            EXPECT_EQ(2u, conf.shares.size());
        }
    }
}
