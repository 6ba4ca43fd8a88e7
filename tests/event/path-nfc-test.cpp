#include "event/path-nfc.h"

#include <gtest/gtest.h>

#include "support/log-capture.h"

namespace {

constexpr char kComposed[] = "/caf\xc3\xa9";     // one character
constexpr char kDecomposed[] = "/cafe\xcc\x81";  // a letter and a combining accent

class PathNfcTest : public testing::Test {
protected:
    LogCapture m_log;
};

TEST_F(PathNfcTest, TellsComposedFromDecomposed) {
    EXPECT_TRUE(IsNfcPath("/"));
    EXPECT_TRUE(IsNfcPath(""));
    EXPECT_TRUE(IsNfcPath("/plain ascii/\x7f\n%s"));
    EXPECT_TRUE(IsNfcPath(kComposed));
    EXPECT_FALSE(IsNfcPath(kDecomposed));
    EXPECT_FALSE(IsNfcPath("/\xe2\x84\xab"));  // the Angstrom sign stands for another letter
    EXPECT_TRUE(IsNfcPath("/\xf0\x9f\x98\x80"));
    EXPECT_TRUE(m_log.Lines().empty());
}

TEST_F(PathNfcTest, FindsADecomposedCharacterAtEveryPlace) {
    for (size_t lead = 0; lead < 40; ++lead) {
        const std::string start = "/" + std::string(lead, 'a');
        EXPECT_FALSE(IsNfcPath(start + "e\xcc\x81"));
        EXPECT_FALSE(IsNfcPath(start + "e\xcc\x81" + "bbbbbbbbbb"));
        EXPECT_TRUE(IsNfcPath(start + "\xc3\xa9" + "bbbbbbbbbb"));
    }
}

TEST_F(PathNfcTest, WhatIsNoUtf8CountsAsNormalized) {
    EXPECT_TRUE(IsNfcPath("/a\xff"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to u_strFromUTF8 for '/a\xff'"));
    EXPECT_TRUE(IsNfcPath("/cut\xc3"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to u_strFromUTF8 for '/cut\xc3'"));
}

TEST_F(PathNfcTest, APathThatJustFitsIsTestedAndALongerOneCountsAsNormalized) {
    // 4096 UTF-16 units: 4094, the letter and its accent.
    EXPECT_FALSE(IsNfcPath("/" + std::string(4093, 'a') + "e\xcc\x81"));
    EXPECT_TRUE(IsNfcPath(std::string(4096, 'a')));
    EXPECT_TRUE(m_log.Lines().empty());
    const std::string longer = "/" + std::string(4094, 'a') + "e\xcc\x81";
    EXPECT_TRUE(IsNfcPath(longer));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to u_strFromUTF8 for '" + longer + "'"));
    EXPECT_TRUE(IsNfcPath(std::string(4097, 'a')));
    EXPECT_EQ(2U, m_log.Lines().size());
}

}  // namespace
