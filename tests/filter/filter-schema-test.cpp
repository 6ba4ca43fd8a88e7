#include "filter/filter-schema.h"

#include <gtest/gtest.h>

#include <map>
#include <set>
#include <string>

#include "filter/filter-parser.h"

namespace {

class FilterSchemaTest : public testing::TestWithParam<const FilterSchema*> {};

TEST_P(FilterSchemaTest, HasVersionOneZeroAndFilledRows) {
    const FilterSchema& schema = *GetParam();
    EXPECT_EQ(1, schema.major);
    EXPECT_EQ(0, schema.minor);
    ASSERT_LE(schema.section_count, FilterSchema::MAX_SECTIONS);
    for (size_t i = 0; i < schema.section_count; ++i) {
        const FilterSection& section = schema.sections[i];
        EXPECT_LE(std::string(section.name).size(), FILTER_MAX_NAME);
        std::set<std::string> names;
        for (size_t k = 0; k < section.key_count; ++k) {
            ASSERT_NE(nullptr, section.keys[k].name) << section.name << " key " << k;
            EXPECT_LE(std::string(section.keys[k].name).size(), FILTER_MAX_NAME);
            EXPECT_TRUE(names.insert(section.keys[k].name).second) << section.keys[k].name;
        }
        EXPECT_EQ(nullptr, section.keys[section.key_count].name) << section.name << ": a row more";
    }
}

TEST_P(FilterSchemaTest, KeysWithOneTargetHaveOneType) {
    for (size_t i = 0; i < GetParam()->section_count; ++i) {
        const FilterSection& section = GetParam()->sections[i];
        std::map<size_t, FilterKeyType> types;
        for (size_t k = 0; k < section.key_count; ++k) {
            const FilterKey& key = section.keys[k];
            EXPECT_EQ(key.type, types.try_emplace(key.offset, key.type).first->second) << key.name;
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Both, FilterSchemaTest,
                         testing::Values(&white_list_schema, &black_list_filter_schema));

}  // namespace
