// One entry of the scheduler: what stands behind the opaque KELDSchedTask.
#pragma once

#include <json/forwards.h>
#include <keld/sched.h>

#include <array>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "host/sched-timetable.h"

namespace keld_host {

// Positions of the fields in a SchedEntry; the names that they are stored under stand in the
// source.
enum SchedText : unsigned {
    SCHED_APP,
    SCHED_APP_NAME,
    SCHED_NAME,
    SCHED_ACTION,
    SCHED_COMMAND,
    SCHED_TEXT_COUNT,
};
enum SchedNumber : unsigned {
    SCHED_STATE,
    SCHED_CAN_RUN_APP_SAME_TIME,
    SCHED_CAN_RUN_TASK_SAME_TIME,
    SCHED_CAN_RUN_FROM_UI,
    SCHED_OWNER,
    SCHED_CAN_EDIT_NAME,
    SCHED_CAN_EDIT_OWNER,
    SCHED_CAN_DELETE_FROM_UI,
    SCHED_LISTABLE,
    SCHED_NUMBER_COUNT,
};

class SchedEntry {
public:
    SchedEntry() { m_numbers[SCHED_LISTABLE] = 1; }

    [[nodiscard]] int Id() const { return m_id; }
    void SetId(int id) { m_id = id; }

    [[nodiscard]] const std::string& Text(SchedText field) const { return m_texts[field]; }
    void SetText(SchedText field, std::string text);
    [[nodiscard]] int Number(SchedNumber field) const { return m_numbers[field]; }
    void SetNumber(SchedNumber field, int number);
    [[nodiscard]] const std::optional<Timetable>& Schedule() const { return m_timetable; }
    void SetSchedule(const std::optional<Timetable>& timetable);

    // Whether the field was set since the entry was made, loaded or settled.
    [[nodiscard]] bool IsSet(SchedText field) const;
    [[nodiscard]] bool IsSet(SchedNumber field) const;
    // Takes over the fields of `other` that are set in this sense.
    void TakeChangesOf(const SchedEntry& other);
    // What is set from here on counts as a change.
    void Settle() { m_changes = 0; }

    [[nodiscard]] Json::Value ToJson() const;
    // False, with the entry unchanged, for what is no stored entry. The result is settled.
    [[nodiscard]] bool FromJson(const Json::Value& json);

private:
    int m_id = -1;
    std::array<std::string, SCHED_TEXT_COUNT> m_texts;
    std::array<int, SCHED_NUMBER_COUNT> m_numbers{};
    std::optional<Timetable> m_timetable;
    uint32_t m_changes = 0;  // a bit for each field: texts, numbers, timetable
};

// Parses a whole JSON text; false for one that is damaged or nested too deeply.
[[nodiscard]] bool ParseJson(const std::string& text, Json::Value* json);
// The text of a value, bytes that are no UTF-8 as they are.
[[nodiscard]] std::string WriteJson(const Json::Value& json);

}  // namespace keld_host

struct KELDSchedTask {
    keld_host::SchedEntry entry;
    std::unique_ptr<KELDSchedTask> next;  // in a list; freed one by one, a list may be long
};
