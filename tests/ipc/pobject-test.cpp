#include "ipc/pobject.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <climits>
#include <stdexcept>
#include <utility>

namespace {

PObject Binary(uint64_t offset, uint64_t length, const std::string& path) {
    PObject value;
    value = PObject::binary_type{offset, length, path};
    return value;
}

PObject Buffer(const std::string& bytes) {
    PObject::buffer_type buffer;
    EXPECT_EQ(0, buffer.Assign(bytes.data(), static_cast<uint16_t>(bytes.size())));
    return PObject(buffer);
}

PObject Array() {
    PObject value;
    value = PObject::empty_array;
    return value;
}

PObject Map() {
    PObject value;
    value = PObject::empty_map;
    return value;
}

TEST(PObject, DefaultIsNullAndReadsAsNothing) {
    const PObject value;
    EXPECT_TRUE(value.IsNull());
    EXPECT_TRUE(value.IsEmpty());
    EXPECT_EQ("null", value.ToText());
    EXPECT_FALSE(value.HasMember("a"));
    EXPECT_EQ("", value.AsString());
    EXPECT_EQ(0, value.AsInt64());
    EXPECT_FALSE(value.AsBool());
    EXPECT_TRUE(value["a"].IsNull());
    EXPECT_EQ(&PObject::empty_object, &value["a"]);
    EXPECT_EQ(&PObject::empty_object, &value[0]);
    EXPECT_EQ(&PObject::empty_array, &value.AsArray());
    EXPECT_EQ(&PObject::empty_map, &value.AsMap());
    EXPECT_EQ(&PObject::empty_binary, &value.AsBinary());
    EXPECT_EQ(&PObject::empty_buffer, &value.AsBuffer());
}

TEST(PObject, EveryKindAnswersOnlyToItsOwnName) {
    const struct {
        PObject value;
        PObject::Kind kind;
        const char* text;
    } cases[] = {
        {PObject(),                                  PObject::KIND_NULL,    "null"  },
        {Array(),                                    PObject::KIND_ARRAY,   "[]"    },
        {Map(),                                      PObject::KIND_MAP,     "{}"    },
        {PObject(7),                                 PObject::KIND_INTEGER, "7"     },
        {PObject("x"),                               PObject::KIND_STRING,  "\"x\"" },
        {Binary(1,                                   2,                     "/p\"q"), PObject::KIND_BINARY, "{offset: 1, length: 2, path: \"/p\"q\"}"},
        {Buffer("abc"), PObject::KIND_BUFFER,                      "{data_length: 3, }"                 },
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.text);
        EXPECT_EQ(c.kind, c.value.GetKind());
        EXPECT_EQ(c.kind == PObject::KIND_NULL, c.value.IsNull());
        EXPECT_EQ(c.kind == PObject::KIND_ARRAY, c.value.IsArray());
        EXPECT_EQ(c.kind == PObject::KIND_MAP, c.value.IsMap());
        EXPECT_EQ(c.kind == PObject::KIND_INTEGER, c.value.IsInteger());
        EXPECT_EQ(c.kind == PObject::KIND_STRING, c.value.IsString());
        EXPECT_EQ(c.kind == PObject::KIND_BINARY, c.value.IsBinary());
        EXPECT_EQ(c.kind == PObject::KIND_BUFFER, c.value.IsBuffer());
        EXPECT_EQ(c.kind == PObject::KIND_ARRAY || c.kind == PObject::KIND_MAP,
                  c.value.IsContainer());
        EXPECT_EQ(c.text, c.value.ToText());
        const PObject copy(c.value);
        EXPECT_EQ(c.text, copy.ToText());
        EXPECT_EQ(c.kind, copy.GetKind());
    }
}

TEST(PObject, IsEmptyAndAsBoolFollowTheContent) {
    PObject map_with_null;
    map_with_null["a"];
    PObject array_with_null = Array();
    array_with_null.AsArray().emplace_back();
    const struct {
        const char* name;
        PObject value;
        bool is_empty;
        bool as_bool;
    } cases[] = {
        {"null",                PObject(),           true,                     false   },
        {"empty string",        PObject(""),         true,                     false   },
        {"the string false",    PObject("false"),    false,                    true    },
        {"zero",                PObject(0),          false,                    false   },
        {"minus one",           PObject(-1),         false,                    true    },
        {"only bit 40",         PObject(1ULL << 40), false,                    true    },
        {"empty array",         Array(),             true,                     false   },
        {"array of null",       array_with_null,     false,                    true    },
        {"empty map",           Map(),               true,                     false   },
        {"map of null",         map_with_null,       false,                    true    },
        {"binary without path", Binary(5,            6,                        ""),      true, false},
        {"binary with path",                Binary(0,                                   0,                                          "/a"),                           false, true},
        {"buffer of no bytes",                Buffer(""),                              true,         false},
        {"buffer of one byte",Buffer("x"),false,true          },
    };
    for (const auto& c : cases) {
        EXPECT_EQ(c.is_empty, c.value.IsEmpty()) << c.name;
        EXPECT_EQ(c.as_bool, c.value.AsBool()) << c.name;
    }
}

TEST(PObject, IntegersAreCutToTheWidthThatIsAskedFor) {
    const PObject value(0x1122334455667788LL);
    EXPECT_EQ(0x55667788, value.AsInt32());
    EXPECT_EQ(0x55667788U, value.AsUInt32());
    EXPECT_EQ(0x7788, value.AsInt16());
    EXPECT_EQ(0x7788U, value.AsUInt16());
    EXPECT_EQ(static_cast<int8_t>(0x88), value.AsInt8());
    EXPECT_EQ(0x88U, value.AsUInt8());
    const PObject negative(-2);
    EXPECT_EQ(-2, negative.AsInt64());
    EXPECT_EQ(UINT64_MAX - 1, negative.AsUInt64());
    EXPECT_EQ(-2, negative.AsInt8());
    EXPECT_EQ(254U, negative.AsUInt8());
    EXPECT_EQ(0, PObject("12").AsInt64());
}

TEST(PObject, EveryIntegerTypeCanBeAssigned) {
    PObject value;
    value = -1;
    EXPECT_EQ(-1, value.AsInt64());
    value = 4000000000U;
    EXPECT_EQ(4000000000, value.AsInt64());
    value = -2L;
    EXPECT_EQ(-2, value.AsInt64());
    value = 3UL;
    EXPECT_EQ(3, value.AsInt64());
    value = LLONG_MIN;
    EXPECT_EQ(LLONG_MIN, value.AsInt64());
    value = ULLONG_MAX;
    EXPECT_EQ(ULLONG_MAX, value.AsUInt64());
    value = static_cast<uint64_t>(5);
    EXPECT_EQ(5U, value.AsUInt64());
    value = static_cast<int64_t>(-5);
    EXPECT_EQ(-5, value.AsInt64());
    value = true;
    EXPECT_TRUE(value.IsInteger());
    EXPECT_EQ("1", value.ToText());
    value = false;
    EXPECT_EQ("0", value.ToText());
}

TEST(PObject, AsStringPrintsTheLowHalfOfAnInteger) {
    EXPECT_EQ("300", PObject(300).AsString());
    EXPECT_EQ("5", PObject((1ULL << 32) + 5).AsString());
    EXPECT_EQ("4294967295", PObject(-1).AsString());
    EXPECT_EQ("", Map().AsString());
    EXPECT_EQ("", Array().AsString());
    EXPECT_EQ("", Binary(1, 2, "/a").AsString());
}

TEST(PObject, StringsAreBytes) {
    const std::string bytes("a\0\n\"%s\xff", 8);
    PObject value(bytes);
    EXPECT_EQ(bytes, value.AsString());
    EXPECT_EQ(bytes, value.StringView());
    EXPECT_EQ("\"" + bytes + "\"", value.ToText());
    value[bytes] = bytes;
    EXPECT_TRUE(value.HasMember(bytes));
    EXPECT_FALSE(value.HasMember("a"));
}

TEST(PObject, TextOfANullPointerIsEmpty) {
    const char* none = nullptr;
    EXPECT_TRUE(PObject(none).IsString());
    EXPECT_EQ("", PObject(none).AsString());
}

TEST(PObject, TextOfATreeIsInKeyOrder) {
    PObject value;
    value["b"] = Array();
    value["b"].AsArray().emplace_back(2);
    value["b"].AsArray().emplace_back("x");
    value["a"] = 1;
    EXPECT_EQ("{\"a\": 1, \"b\": [2, \"x\"]}", value.ToText());
    EXPECT_EQ("18446744073709551615", PObject(-1).ToText());
}

TEST(PObject, KeysAreOrderedAsUnsignedBytes) {
    PObject value;
    value["\xc3\xa4"] = 3;
    value["z"] = 2;
    value["A"] = 1;
    EXPECT_EQ("{\"A\": 1, \"z\": 2, \"\xc3\xa4\": 3}", value.ToText());
}

TEST(PObject, ConstAccessInsertsNothing) {
    PObject value;
    value["a"] = 1;
    const PObject& read = value;
    EXPECT_TRUE(read["b"].IsNull());
    EXPECT_EQ(1U, read.AsMap().size());
    EXPECT_TRUE(PObject("text")["a"].IsNull());
}

TEST(PObject, AssigningToAMemberOfAStringDropsTheString) {
    PObject value("text");
    value["a"] = 1;
    EXPECT_EQ("{\"a\": 1}", value.ToText());
}

TEST(PObject, NonConstMemberAccessInsertsNull) {
    PObject value;
    EXPECT_TRUE(value["a"].IsNull());
    EXPECT_EQ("{\"a\": null}", value.ToText());
}

TEST(PObject, NonConstAccessorsReplaceAnotherKind) {
    PObject value("text");
    EXPECT_TRUE(value.AsArray().empty());
    EXPECT_TRUE(value.IsArray());
    EXPECT_TRUE(value.AsMap().empty());
    EXPECT_TRUE(value.IsMap());
    EXPECT_TRUE(value.AsBinary().IsEmpty());
    EXPECT_TRUE(value.IsBinary());
    EXPECT_TRUE(value.AsBuffer().IsEmpty());
    EXPECT_TRUE(value.IsBuffer());
    EXPECT_TRUE(PObject::empty_array.empty());
    EXPECT_TRUE(PObject::empty_map.empty());
}

TEST(PObject, IndexReadsArraysAndMapsByPosition) {
    PObject array = Array();
    array.AsArray().emplace_back("x");
    const PObject& read_array = array;
    EXPECT_EQ("x", read_array[0].AsString());
    EXPECT_EQ(&PObject::empty_object, &read_array[1]);
    EXPECT_EQ(&PObject::empty_object, &read_array[-1]);

    PObject map;
    map["b"] = 2;
    map["a"] = 1;
    const PObject& read_map = map;
    EXPECT_EQ(1, read_map[0].AsInt32());
    EXPECT_EQ(2, read_map[1].AsInt32());
    EXPECT_EQ(&PObject::empty_object, &read_map[2]);
    EXPECT_EQ(&PObject::empty_object, &read_map[-1]);
    map[1] = 5;
    EXPECT_EQ("{\"a\": 1, \"b\": 5}", map.ToText());
}

TEST(PObject, WritingByIndexOutsideAMapThrows) {
    const auto text_of = [](PObject value, int index) -> std::string {
        try {
            value[index] = 1;
        } catch (const std::out_of_range& error) {
            return error.what();
        }
        return "nothing thrown";
    };
    const std::string expected = "out_of_range: PObject::operator[]";
    PObject array = Array();
    array.AsArray().emplace_back(1);
    PObject map;
    map["a"] = 1;
    EXPECT_EQ(expected, text_of(array, 0));
    EXPECT_EQ(expected, text_of(PObject(), 0));
    EXPECT_EQ(expected, text_of(PObject("x"), 0));
    EXPECT_EQ(expected, text_of(map, 1));
    EXPECT_EQ(expected, text_of(map, -1));
}

TEST(PObject, ACopySharesNothing) {
    PObject first;
    first["list"] = Array();
    first["list"].AsArray().emplace_back("x");
    first["deep"]["deeper"] = 1;
    PObject copy = first;
    copy["list"].AsArray().emplace_back("y");
    copy["deep"]["deeper"] = 2;
    EXPECT_EQ("{\"deep\": {\"deeper\": 1}, \"list\": [\"x\"]}", first.ToText());
    EXPECT_EQ("{\"deep\": {\"deeper\": 2}, \"list\": [\"x\", \"y\"]}", copy.ToText());
}

TEST(PObject, AssigningFromInsideOfItselfIsSafe) {
    PObject value;
    value["a"]["b"] = "inner";
    value = value["a"];
    EXPECT_EQ("{\"b\": \"inner\"}", value.ToText());
    value["list"] = Array();
    value["list"].AsArray().emplace_back(1);
    value = value["list"].AsArray();
    EXPECT_EQ("[1]", value.ToText());
    const PObject& itself = value;
    value = itself;
    EXPECT_EQ("[1]", value.ToText());
    PObject outer;
    outer["m"]["k"] = 1;
    outer = outer["m"].AsMap();
    EXPECT_EQ("{\"k\": 1}", outer.ToText());
    outer = std::move(outer["k"]);
    EXPECT_EQ("1", outer.ToText());
}

TEST(PObject, MovingLeavesNullBehind) {
    PObject first("x");
    PObject second(std::move(first));
    EXPECT_TRUE(first.IsNull());  // NOLINT: that is the promise
    EXPECT_EQ(PObject::KIND_NULL, first.GetKind());
    EXPECT_EQ("x", second.AsString());
}

TEST(PObject, SwapExchangesWithoutACopy) {
    PObject first;
    first["a"] = 1;
    PObject second("x");
    const PObject::map_type* payload = &first.AsMap();
    first.Swap(second);
    EXPECT_EQ("x", first.AsString());
    EXPECT_EQ(payload, &second.AsMap());
}

TEST(PObject, ClearGivesNull) {
    PObject value;
    value["a"] = 1;
    value.Clear();
    EXPECT_TRUE(value.IsNull());
    EXPECT_FALSE(value.IsMap());
    value.Clear();
    EXPECT_TRUE(value.IsNull());
}

TEST(PObjectBinary, ClearZeroesAllFields) {
    PObject::binary_type binary{1, 2, "/a"};
    binary.Clear();
    EXPECT_EQ(0U, binary.offset);
    EXPECT_EQ(0U, binary.length);
    EXPECT_TRUE(binary.IsEmpty());
}

TEST(PObjectBuffer, ShrinksOnlyWhenMoreThanTwiceTooLarge) {
    const std::string bytes(100, 'x');
    const struct {
        uint16_t first, second, expected;
    } cases[] = {
        {100, 40,  40 },
        {100, 50,  100},
        {100, 49,  49 },
        {100, 100, 100},
        {10,  11,  11 },
        {99,  49,  49 },
        {99,  50,  99 },
        {100, 0,   0  },
    };
    for (const auto& c : cases) {
        PObject::buffer_type buffer;
        ASSERT_EQ(0, buffer.Assign(bytes.data(), c.first));
        EXPECT_EQ(c.first, buffer.Capacity());
        ASSERT_EQ(0, buffer.Assign(bytes.data(), c.second));
        EXPECT_EQ(c.expected, buffer.Capacity()) << c.first << " then " << c.second;
        EXPECT_EQ(c.second, buffer.Length());
    }
}

TEST(PObjectBuffer, ClearZeroesTheBlockAndKeepsIt) {
    PObject::buffer_type buffer;
    buffer.Clear();  // nothing there yet
    EXPECT_EQ(nullptr, buffer.Data());
    ASSERT_EQ(0, buffer.Assign("secret", 6));
    buffer.Clear();
    EXPECT_TRUE(buffer.IsEmpty());
    EXPECT_EQ(6U, buffer.Capacity());
    EXPECT_EQ(std::string(6, '\0'), std::string(static_cast<const char*>(buffer.Data()), 6));
}

TEST(PObjectBuffer, ACopyHasItsOwnBytes) {
    PObject::buffer_type first;
    ASSERT_EQ(0, first.Assign("abc", 3));
    PObject::buffer_type second(first);
    ASSERT_EQ(0, second.Assign("xyz", 3));
    EXPECT_EQ("abc", std::string(static_cast<const char*>(first.Data()), 3));
    const PObject::buffer_type empty_copy{PObject::buffer_type()};
    EXPECT_EQ(0U, empty_copy.Capacity());
}

// A million levels: a recursive walk would need some hundred megabytes of stack.
constexpr int kDepth = 1000000;
constexpr int kMapDepth = 200000;

PObject DeepArray() {
    PObject inner;
    for (int i = 0; i < kDepth; ++i) {
        PObject outer;
        outer.AsArray().emplace_back(std::move(inner));
        inner = std::move(outer);
    }
    return inner;
}

PObject DeepMap() {
    PObject inner;
    for (int i = 0; i < kMapDepth; ++i) {
        PObject outer;
        outer["k"] = std::move(inner);
        inner = std::move(outer);
    }
    return inner;
}

TEST(PObjectDepth, AMillionNestedArraysAreCopiedPrintedSwappedAndDestroyed) {
    PObject value = DeepArray();
    PObject copy(value);
    value.Clear();
    EXPECT_TRUE(value.IsNull());
    value.Swap(copy);
    const std::string text = value.ToText();
    EXPECT_EQ(std::string(kDepth, '[') + "null" + std::string(kDepth, ']'), text);
    PObject assigned;
    assigned = value;
    value = std::as_const(value)[0];  // drops the outermost level out of itself
    EXPECT_EQ(static_cast<size_t>(kDepth - 1) * 2 + 4, value.ToText().size());
    EXPECT_EQ(text, assigned.ToText());
}

TEST(PObjectDepth, DeeplyNestedMapsAreCopiedPrintedAndDestroyed) {
    const PObject value = DeepMap();
    const PObject copy(value);
    const std::string text = copy.ToText();
    EXPECT_EQ(static_cast<size_t>(kMapDepth) * 7 + 4, text.size());
    EXPECT_EQ("{\"k\": {\"k\": ", text.substr(0, 12));
}

TEST(PObjectDepth, DeepChildrenOfAWideArrayAreDestroyed) {
    PObject value;
    for (int i = 0; i < 3; ++i) value.AsArray().push_back(DeepArray());
    value.AsArray().erase(value.AsArray().begin());
    EXPECT_EQ(2U, value.AsArray().size());
    value = 1;
    EXPECT_EQ("1", value.ToText());
}

}  // namespace
