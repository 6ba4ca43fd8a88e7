#include "host/sched-entry.h"

#include <json/reader.h>
#include <json/value.h>
#include <json/writer.h>

#include <exception>

namespace keld_host {
namespace {

constexpr const char* SCHEDULE_KEY = "schedule";

struct TextRow {
    SchedText field;
    const char* key;
};
constexpr TextRow TEXTS[] = {
    {SCHED_APP,      "app"     },
    {SCHED_APP_NAME, "app_name"},
    {SCHED_NAME,     "name"    },
    {SCHED_ACTION,   "action"  },
    {SCHED_COMMAND,  "command" },
};
static_assert(std::size(TEXTS) == SCHED_TEXT_COUNT);

struct NumberRow {
    SchedNumber field;
    const char* key;
};
constexpr NumberRow NUMBERS[] = {
    {SCHED_STATE,                  "state"                 },
    {SCHED_CAN_RUN_APP_SAME_TIME,  "can_run_app_same_time" },
    {SCHED_CAN_RUN_TASK_SAME_TIME, "can_run_task_same_time"},
    {SCHED_CAN_RUN_FROM_UI,        "can_run_from_ui"       },
    {SCHED_OWNER,                  "owner"                 },
    {SCHED_CAN_EDIT_NAME,          "can_edit_name"         },
    {SCHED_CAN_EDIT_OWNER,         "can_edit_owner"        },
    {SCHED_CAN_DELETE_FROM_UI,     "can_delete_from_ui"    },
    {SCHED_LISTABLE,               "listable"              },
};
static_assert(std::size(NUMBERS) == SCHED_NUMBER_COUNT);

constexpr uint32_t TextBit(unsigned field) { return 1U << field; }
constexpr uint32_t NumberBit(unsigned field) { return 1U << (SCHED_TEXT_COUNT + field); }
constexpr uint32_t SCHEDULE_BIT = NumberBit(SCHED_NUMBER_COUNT);

}  // namespace

void SchedEntry::SetText(SchedText field, std::string text) {
    m_texts[field] = std::move(text);
    m_changes |= TextBit(field);
}

void SchedEntry::SetNumber(SchedNumber field, int number) {
    m_numbers[field] = number;
    m_changes |= NumberBit(field);
}

void SchedEntry::SetSchedule(const std::optional<Timetable>& timetable) {
    m_timetable = timetable;
    m_changes |= SCHEDULE_BIT;
}

bool SchedEntry::IsSet(SchedText field) const { return (m_changes & TextBit(field)) != 0; }

bool SchedEntry::IsSet(SchedNumber field) const { return (m_changes & NumberBit(field)) != 0; }

void SchedEntry::TakeChangesOf(const SchedEntry& other) {
    for (const TextRow& row : TEXTS) {
        if (other.IsSet(row.field)) SetText(row.field, other.Text(row.field));
    }
    for (const NumberRow& row : NUMBERS) {
        if (other.IsSet(row.field)) SetNumber(row.field, other.Number(row.field));
    }
    if ((other.m_changes & SCHEDULE_BIT) != 0) SetSchedule(other.m_timetable);
}

Json::Value SchedEntry::ToJson() const {
    Json::Value json(Json::objectValue);
    json["id"] = m_id;
    for (const TextRow& row : TEXTS) json[row.key] = m_texts[row.field];
    for (const NumberRow& row : NUMBERS) json[row.key] = m_numbers[row.field];
    if (m_timetable) json[SCHEDULE_KEY] = m_timetable->ToJson();
    return json;
}

bool SchedEntry::FromJson(const Json::Value& json) {
    SchedEntry entry;
    if (!json.isObject() || !json["id"].isInt() || json["id"].asInt() <= 0) return false;
    entry.m_id = json["id"].asInt();
    for (const TextRow& row : TEXTS) {
        if (!json[row.key].isString()) return false;
        entry.m_texts[row.field] = json[row.key].asString();
    }
    for (const NumberRow& row : NUMBERS) {
        if (!json[row.key].isInt()) return false;
        entry.m_numbers[row.field] = json[row.key].asInt();
    }
    if (json.isMember(SCHEDULE_KEY) && !ParseTimetable(json[SCHEDULE_KEY], &entry.m_timetable)) {
        return false;
    }
    *this = std::move(entry);
    return true;
}

bool ParseJson(const std::string& text, Json::Value* json) {
    const Json::CharReaderBuilder builder;
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    std::string errors;
    try {
        return reader->parse(text.data(), text.data() + text.size(), json, &errors);
    } catch (const std::exception&) {
        return false;  // the way this parser refuses a text that is nested too deeply
    }
}

std::string WriteJson(const Json::Value& json) {
    Json::StreamWriterBuilder builder;
    builder["emitUTF8"] = true;
    builder["indentation"] = "    ";
    return Json::writeString(builder, json) + "\n";
}

}  // namespace keld_host
