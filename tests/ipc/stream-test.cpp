#include "ipc/stream.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <ostream>

#include "ipc/memory-channel.h"
#include "ipc/pobject.h"
#include "support/log-capture.h"

namespace {

using Bytes = std::vector<int>;

std::string ToString(const Bytes& bytes) {
    std::string out;
    for (const int byte : bytes) out += static_cast<char>(byte);
    return out;
}

std::string Encode(const PObject& value) {
    MemoryChannel channel;
    PStream stream;
    EXPECT_EQ(0, stream.Send(channel, value));
    return channel.pipe.output;
}

int Decode(const std::string& bytes, PObject& value, size_t* used = nullptr) {
    MemoryChannel channel(bytes);
    PStream stream;
    const int result = stream.Recv(channel, value);
    // What is left in the ring has not been used.
    if (used != nullptr) {
        *used = channel.pipe.position - channel.Buffered().size();
    }
    return result;
}

PObject ArrayOf(std::initializer_list<PObject> elements) {
    PObject value;
    value = PObject::array_type(elements);
    return value;
}

PObject MapOf(std::initializer_list<std::pair<const char*, PObject>> entries) {
    PObject value;
    value = PObject::empty_map;
    for (const auto& [key, member] : entries) value[key] = member;
    return value;
}

struct WireCase {
    const char* name;
    PObject value;
    Bytes bytes;
};

void PrintTo(const WireCase& wire_case, std::ostream* out) { *out << wire_case.name; }

class WireTest : public testing::TestWithParam<WireCase> {};

TEST_P(WireTest, IsEncodedToExactlyTheseBytes) {
    EXPECT_EQ(ToString(GetParam().bytes), Encode(GetParam().value));
}

TEST_P(WireTest, IsDecodedBackAndUsesNoByteMore) {
    PObject value("what was there before");
    size_t used = 0;
    EXPECT_EQ(0, Decode(ToString(GetParam().bytes) + "next", value, &used));
    EXPECT_EQ(GetParam().value.ToText(), value.ToText());
    EXPECT_EQ(GetParam().value.GetKind(), value.GetKind());
    EXPECT_EQ(GetParam().bytes.size(), used);
}

TEST_P(WireTest, CutShortAtAnyLengthIsAnInputError) {
    const std::string bytes = ToString(GetParam().bytes);
    for (size_t length = 0; length < bytes.size(); ++length) {
        PObject value;
        EXPECT_EQ(ERR_IO, Decode(bytes.substr(0, length), value)) << "cut at " << length;
    }
}

TEST_P(WireTest, ArrivesByteByByte) {
    MemoryChannel channel(ToString(GetParam().bytes), 3);  // rings smaller than most fields
    channel.pipe.read_limit = 1;
    PStream stream;
    PObject value;
    EXPECT_EQ(0, stream.Recv(channel, value));
    EXPECT_EQ(GetParam().value.ToText(), value.ToText());
}

const WireCase kWireCases[] = {
    {"Null",          PObject(),                                                 {0x00, 0x00}                                             },
    {"Zero",          PObject(0),                                                {0x01, 1, 0}                                             },
    {"OneByte",       PObject(255),                                              {0x01, 1, 0xff}                                          },
    {"TwoBytes",      PObject(256),                                              {0x01, 2, 0x01, 0x00}                                    },
    {"TwoBytesFull",  PObject(65535),                                            {0x01, 2, 0xff, 0xff}                                    },
    {"FourBytes",     PObject(65536),                                            {0x01, 4, 0, 1, 0, 0}                                    },
    {"FourBytesFull", PObject(0xffffffffU),                                      {0x01, 4, 0xff, 0xff, 0xff, 0xff}                        },
    {"EightBytes",    PObject(1ULL << 32),                                       {0x01, 8, 0, 0, 0, 1, 0, 0, 0, 0}                        },
    {"MinusOne",      PObject(-1),                                               {0x01, 8, 0xff, 0xff, 0xff, 0xff, 0xff, 0xff, 0xff, 0xff}},
    {"True",          PObject(true),                                             {0x01, 1, 1}                                             },
    {"EmptyString",   PObject(""),                                               {0x10, 0, 0}                                             },
    {"String",        PObject("ab"),                                             {0x10, 0, 2, 'a', 'b'}                                   },
    {"NoUtf8",        PObject("\xff\n%\""),                                      {0x10, 0, 4, 0xff, '\n', '%', '"'}                       },
    {"EmptyArray",    ArrayOf({}),                                               {0x41, 0x40}                                             },
    {"EmptyMap",      MapOf({}),                                                 {0x42, 0x40}                                             },
    {"MapOfOne",      MapOf({{"a", 1}}),                                         {0x42, 0x10, 0, 1, 'a', 0x01, 1, 1, 0x40}                },
    {"EmptyKey",      MapOf({{"", 1}}),                                          {0x42, 0x10, 0, 0, 0x01, 1, 1, 0x40}                     },
    {"KeysInOrder",
     MapOf({{"b", {}}, {"a", {}}}),
     {0x42, 0x10, 0, 1, 'a', 0, 0, 0x10, 0, 1, 'b', 0, 0, 0x40}                                                                           },
    {"ArrayOfAll",
     ArrayOf({PObject(), PObject(2), PObject("x"), ArrayOf({}), MapOf({})}),
     {0x41, 0, 0, 1, 1, 2, 0x10, 0, 1, 'x', 0x41, 0x40, 0x42, 0x40, 0x40}                                                                 },
    {"Nested",
     MapOf({{"m", MapOf({{"l", ArrayOf({ArrayOf({PObject(7)})})}})}, {"z", 1}}),
     {0x42, 0x10, 0,    1,    'm',  0x42, 0x10, 0, 1,   'l', 0x41, 0x41, 1,
      1,    7,    0x40, 0x40, 0x40, 0x10, 0,    1, 'z', 1,   1,    1,    0x40}                                                            },
};

INSTANTIATE_TEST_SUITE_P(Wire, WireTest, testing::ValuesIn(kWireCases),
                         [](const auto& instance) { return std::string(instance.param.name); });

TEST(PStream, SeveralValuesFollowEachOtherOnOneChannel) {
    MemoryChannel channel(Encode(PObject("first")) + Encode(PObject(2)));
    PStream stream;
    PObject value;
    ASSERT_EQ(0, stream.Recv(channel, value));
    EXPECT_EQ("first", value.AsString());
    ASSERT_EQ(0, stream.Recv(channel, value));
    EXPECT_EQ(2, value.AsInt32());
}

TEST(PStream, AKeyLosesItsFirstUnderscore) {
    PObject arrived;
    ASSERT_EQ(0, Decode(Encode(MapOf({
                            {"_id", 1},
                            {"__x", 2},
                            {"_",   3},
                            {"a_b", 4}
    })),
                        arrived));
    EXPECT_EQ("{\"\": 3, \"_x\": 2, \"a_b\": 4, \"id\": 1}", arrived.ToText());
}

TEST(PStream, OfTwoKeysThatBecomeOneTheLaterWins) {
    const PObject value = MapOf({
        {"_x", "first" },
        {"x",  "second"}
    });
    EXPECT_EQ(ToString({0x42, 0x10, 0,   1,    'x', 0x10, 0,   5,   'f', 'i', 'r', 's', 't', 0x10,
                        0,    1,    'x', 0x10, 0,   6,    's', 'e', 'c', 'o', 'n', 'd', 0x40}),
              Encode(value));
    PObject arrived;
    ASSERT_EQ(0, Decode(Encode(value), arrived));
    EXPECT_EQ("{\"x\": \"second\"}", arrived.ToText());
}

TEST(PStream, ARepeatedKeyReplacesTheWholeEarlierValue) {
    PObject arrived;
    ASSERT_EQ(0,
              Decode(ToString({0x42, 0x10, 0, 1,   'a',  0x42, 0x10, 0, 1,   'x', 0, 0,    0x40,
                               0x10, 0,    1, 'a', 0x42, 0x10, 0,    1, 'y', 0,   0, 0x40, 0x40}),
                     arrived));
    EXPECT_EQ("{\"a\": {\"y\": null}}", arrived.ToText());
}

TEST(PStream, KeysOutOfOrderArriveInOrder) {
    PObject arrived;
    ASSERT_EQ(0, Decode(ToString({0x42, 0x10, 0, 1, 'b', 1, 1, 2, 0x10, 0, 1, 'a', 1, 1, 1, 0x40}),
                        arrived));
    EXPECT_EQ("{\"a\": 1, \"b\": 2}", arrived.ToText());
}

TEST(PStream, AnIntegerOfAnyWidthUpToEightIsUnsigned) {
    const struct {
        Bytes bytes;
        uint64_t expected;
    } cases[] = {
        {{1, 0},                            0                    },
        {{1, 3, 1, 2, 3},                   0x010203             },
        {{1, 4, 0xff, 0xff, 0xff, 0xff},    4294967295U          },
        {{1, 7, 0xff, 0, 0, 0, 0, 0, 1},    0xff000000000001ULL  },
        {{1, 8, 0x80, 0, 0, 0, 0, 0, 0, 0}, 0x8000000000000000ULL},
    };
    for (const auto& c : cases) {
        PObject value;
        ASSERT_EQ(0, Decode(ToString(c.bytes), value));
        EXPECT_EQ(c.expected, value.AsUInt64());
    }
}

TEST(PStream, AStringEndsAtItsFirstNulButIsConsumedWhole) {
    MemoryChannel channel(ToString({0x10, 0, 4, 'a', 0, 'b', 'c', 1, 1, 9}));
    PStream stream;
    PObject value;
    ASSERT_EQ(0, stream.Recv(channel, value));
    EXPECT_EQ("a", value.StringView());
    ASSERT_EQ(0, stream.Recv(channel, value));
    EXPECT_EQ(9, value.AsInt32());
}

TEST(PStream, AKeyEndsAtItsFirstNul) {
    PObject value;
    ASSERT_EQ(0, Decode(ToString({0x42, 0x10, 0, 3, 'k', 0, 'x', 1, 1, 9, 0x40}), value));
    EXPECT_EQ("{\"k\": 9}", value.ToText());
}

TEST(PStream, ALongStringPassesWhole) {
    for (const size_t length : {4095U, 4096U, 4097U, 65534U, 65535U}) {
        const std::string text(length, 't');
        PObject arrived;
        ASSERT_EQ(0, Decode(Encode(MapOf({
                                {"before", 1   },
                                {"text",   text}
        })),
                            arrived))
            << length;
        EXPECT_EQ(text, arrived["text"].AsString());
    }
}

TEST(PStream, OfAStringTooLongForItsLengthFieldAllBytesAreSent) {
    const std::string bytes = Encode(PObject(std::string(65536 + 5, 'x')));
    EXPECT_EQ(ToString({0x10, 0, 5}), bytes.substr(0, 3));
    EXPECT_EQ(3U + 65536 + 5, bytes.size());
}

TEST(PStream, AStringAboveTheCapacityFails) {
    MemoryChannel channel;
    PStream stream;
    LogCapture log;
    EXPECT_EQ(ERR_IO, stream.Send(channel, MapOf({
                                               {"k", std::string(81921, 'x')}
    })));
    EXPECT_TRUE(log.Has("[ERR] Write: Exceed maximum data block size"));
    EXPECT_TRUE(log.Has("[WARN] Channel: -4"));
    EXPECT_TRUE(log.Has("[ERR] Error stack: k.k"));
    EXPECT_EQ(0, stream.Send(channel, PObject(std::string(81920, 'x'))));
}

TEST(PStream, ABufferCanNotBeSent) {
    MemoryChannel channel;
    PStream stream;
    LogCapture log;
    const PObject buffer{PObject::buffer_type()};
    EXPECT_EQ(-1, stream.Send(channel, buffer));
    EXPECT_TRUE(log.Has("[ERR] Error stack: "));
    EXPECT_EQ(-1, stream.Send(channel, MapOf({
                                           {"a", buffer}
    })));
    EXPECT_TRUE(log.Has("[ERR] Error stack: a.a"));
    EXPECT_EQ(-1, stream.Send(channel, MapOf({
                                           {"_a", MapOf({{"b", buffer}})},
                                           {"Z",  1                     }
    })));
    EXPECT_TRUE(log.Has("[ERR] Error stack: a.a.b"));
    EXPECT_EQ(-1, stream.Send(channel, MapOf({
                                           {"k", ArrayOf({MapOf({{"x", 1}}), buffer})}
    })));
    EXPECT_TRUE(log.Has("[ERR] Error stack: k.k"));
}

TEST(PStream, AfterAFailureTheStreamIsClean) {
    MemoryChannel channel;
    PStream stream;
    EXPECT_EQ(-1, stream.Send(channel, MapOf({
                                           {"a", PObject(PObject::buffer_type())}
    })));
    std::string path = "not empty";
    uint64_t done = 1;
    uint64_t total = 1;
    stream.GetStatus(path, done, total);
    EXPECT_EQ("", path);
    EXPECT_EQ(0U, done);
    EXPECT_EQ(0U, total);
    LogCapture log;
    EXPECT_EQ(0, stream.Send(channel, ArrayOf({})));
    EXPECT_TRUE(log.Has("[DBG] write array of 0"));  // at the left: no level is left over
}

TEST(PStream, AFailingChannelIsAnInputErrorWhateverItsCode) {
    MemoryChannel channel(std::string(1, '\x10'));
    const std::atomic<int> aborted{1};
    channel.SetAbortFlag(&aborted);
    PStream stream;
    PObject value;
    LogCapture log;
    EXPECT_EQ(ERR_IO, stream.Recv(channel, value));
    EXPECT_TRUE(log.Has("[WARN] Channel: -1"));
    channel.SetAbortFlag(nullptr);
    channel.pipe.writes_left = 0;
    EXPECT_EQ(ERR_IO, stream.Send(channel, PObject(1)));
    EXPECT_TRUE(log.Has("[WARN] Channel: -2"));
    channel.Close();
    EXPECT_EQ(ERR_IO, stream.Send(channel, PObject(1)));
    EXPECT_EQ(ERR_IO, stream.Recv(channel, value));
}

TEST(PStream, DebugLinesAreIndentedByTheLevelUpToEleven) {
    PObject value;
    for (int i = 0; i < 13; ++i) value = ArrayOf({value});
    LogCapture log;
    PObject arrived;
    EXPECT_EQ(0, Decode(Encode(value), arrived));
    EXPECT_EQ(1, log.Count("[DBG] write array of 1"));
    EXPECT_EQ(1, log.Count("[DBG]   write array of 1"));
    EXPECT_EQ(2, log.Count("[DBG] " + std::string(22, ' ') + "write array of 1"));
    EXPECT_EQ(2, log.Count("[DBG] " + std::string(22, ' ') + "read array"));
    EXPECT_FALSE(log.Contains(std::string(24, ' ')));
}

}  // namespace
