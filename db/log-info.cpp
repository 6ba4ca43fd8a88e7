#include "db/log-info.h"

#include <json/value.h>
#include <json/writer.h>

#include <algorithm>
#include <iterator>

#include "db/log-db.h"

namespace {

struct DescriptionRow {
    LogDescription::ID id;
    size_t parameters;
    LogDB::LOG_TYPE type;
};

constexpr DescriptionRow kDescriptions[] = {
    {LogDescription::LOG_DESC_TASK_ADDED,            1, LogDB::LOG_TYPE_INFO      },
    {LogDescription::LOG_DESC_TASK_REMOVED,          1, LogDB::LOG_TYPE_INFO      },
    {LogDescription::LOG_DESC_DEFAULT_TASK_ENABLED,  1, LogDB::LOG_TYPE_INFO      },
    {LogDescription::LOG_DESC_DEFAULT_TASK_DISABLED, 1, LogDB::LOG_TYPE_INFO      },
    {LogDescription::LOG_DESC_TASK_RENAMED,          2, LogDB::LOG_TYPE_INFO      },
    {LogDescription::LOG_DESC_TASK_SETTING_CHANGED,  1, LogDB::LOG_TYPE_INFO      },
    {LogDescription::LOG_DESC_TASK_STARTED,          1, LogDB::LOG_TYPE_INFO      },
    {LogDescription::LOG_DESC_TASK_DONE,             1, LogDB::LOG_TYPE_INFO      },
    {LogDescription::LOG_DESC_TASK_STOPPED,          1, LogDB::LOG_TYPE_TASK_ERROR},
    {LogDescription::LOG_DESC_TASK_FAILED,           1, LogDB::LOG_TYPE_TASK_ERROR},
    {LogDescription::LOG_DESC_ROTATED,               2, LogDB::LOG_TYPE_INFO      },
    {LogDescription::LOG_DESC_FILE_FAILED,           2, LogDB::LOG_TYPE_FILE_ERROR},
};

std::string WriteArray(const Json::Value& array) {
    // What is no UTF-8 becomes U+FFFD here, and every character above ASCII an escape: the stored
    // text is valid whatever bytes a name has.
    std::string text = Json::FastWriter().write(array);
    text.erase(text.find_last_not_of(" \t\f\n\r\v") + 1);
    return text;
}

}  // namespace

void LogInfo::Clear() { *this = LogInfo(); }

int LogInfo::SetDescriptionTexts(LogDescription::ID id,
                                 std::initializer_list<std::string_view> texts) {
    const auto* row = std::ranges::find(kDescriptions, id, &DescriptionRow::id);
    if (row == std::end(kDescriptions) || texts.size() < row->parameters) return -1;
    Json::Value array(Json::arrayValue);
    for (const std::string_view* text = texts.begin(); array.size() < row->parameters; ++text) {
        array.append(Json::Value(text->data(), text->data() + text->size()));
    }
    log_type = row->type;
    description_id = row->id;
    description_param = WriteArray(array);
    return 0;
}
