#include "filter/filter-schema.h"

#include <type_traits>

#include "filter/filter-record.h"

static_assert(std::is_standard_layout_v<WhiteFilter> && std::is_standard_layout_v<BlackFilter>,
              "values are stored by the offset of their field");

namespace {

using Common = decltype(BlackFilter::common);
using File = decltype(BlackFilter::file);
using Directory = decltype(BlackFilter::directory);
using WhiteCommon = decltype(WhiteFilter::common);
using WhiteFile = decltype(WhiteFilter::file);

}  // namespace

const FilterSchema white_list_schema = {
    1,
    0,
    3,
    {
      {"Version",
         0,
         2,
         {
             {"major", FILTER_KEY_INT32, offsetof(WhiteFilter, major)},
             {"minor", FILTER_KEY_INT32, offsetof(WhiteFilter, minor)},
         }},
      {"Common",
         offsetof(WhiteFilter, common),
         1,
         {
             {"white_name", FILTER_KEY_LIST, offsetof(WhiteCommon, white_name)},
         }},
      {"File",
         offsetof(WhiteFilter, file),
         1,
         {
             {"white_ext", FILTER_KEY_LIST, offsetof(WhiteFile, white_ext)},
         }},
      },
};

const FilterSchema black_list_filter_schema = {
    1,
    0,
    4,
    {
      {"Version",
         0,
         2,
         {
             {"major", FILTER_KEY_INT32, offsetof(BlackFilter, major)},
             {"minor", FILTER_KEY_INT32, offsetof(BlackFilter, minor)},
         }},
      {"Common",
         offsetof(BlackFilter, common),
         9,
         {
             {"black_char", FILTER_KEY_STRING, offsetof(Common, black_char)},
             {"black_prefix", FILTER_KEY_LIST, offsetof(Common, black_prefix)},
             {"black_suffix", FILTER_KEY_LIST, offsetof(Common, black_suffix)},
             {"black_name", FILTER_KEY_LIST, offsetof(Common, black_name)},
             {"black_dir_prefix", FILTER_KEY_LIST, offsetof(Common, black_dir_prefix)},
             {"black_path_prefix_selective_sync", FILTER_KEY_LIST,
              offsetof(Common, black_dir_prefix)},
             {"max_length", FILTER_KEY_UINT64, offsetof(Common, max_length)},
             {"max_path", FILTER_KEY_UINT64, offsetof(Common, max_path)},
             {"max_dst_path", FILTER_KEY_UINT64, offsetof(Common, max_dst_path)},
         }},
      {"File",
         offsetof(BlackFilter, file),
         10,
         {
             {"black_char", FILTER_KEY_STRING, offsetof(File, black_char)},
             {"black_prefix", FILTER_KEY_LIST, offsetof(File, black_prefix)},
             {"black_suffix", FILTER_KEY_LIST, offsetof(File, black_suffix)},
             {"black_glob", FILTER_KEY_LIST, offsetof(File, black_glob)},
             {"black_ext", FILTER_KEY_LIST, offsetof(File, black_ext)},
             {"black_ext_selective_sync", FILTER_KEY_LIST, offsetof(File, black_ext)},
             {"black_name", FILTER_KEY_LIST, offsetof(File, black_name)},
             {"black_name_selective_sync", FILTER_KEY_LIST, offsetof(File, black_name)},
             {"max_size", FILTER_KEY_UINT64, offsetof(File, max_size)},
             {"max_size_selective_sync", FILTER_KEY_UINT64, offsetof(File, max_size)},
         }},
      {"Directory",
         offsetof(BlackFilter, directory),
         5,
         {
             {"black_char", FILTER_KEY_STRING, offsetof(Directory, black_char)},
             {"black_name", FILTER_KEY_LIST, offsetof(Directory, black_name)},
             {"black_prefix", FILTER_KEY_LIST, offsetof(Directory, black_prefix)},
             {"black_suffix", FILTER_KEY_LIST, offsetof(Directory, black_suffix)},
             {"black_glob", FILTER_KEY_LIST, offsetof(Directory, black_glob)},
         }},
      },
};
