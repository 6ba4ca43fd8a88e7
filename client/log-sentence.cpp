#include "client/log-sentence.h"

#include <algorithm>
#include <iterator>
#include <vector>

#include "client/log-parameters.h"
#include "client/outcome-text.h"
#include "client/text.h"
#include "db/log-description.h"
#include "db/log-info.h"

namespace {

using Names = std::vector<std::string>;

// Damaged text may be of any length.
constexpr size_t DAMAGED_WIDTH = 400;

struct SentenceRow {
    int id;
    size_t names;
    const char* sentence;  // "{1}" and "{2}" stand for the names
    bool has_outcome;
};

constexpr SentenceRow SENTENCES[] = {
    {LogDescription::LOG_DESC_TASK_ADDED,            1, "Task {1} was added",                    false},
    {LogDescription::LOG_DESC_TASK_REMOVED,          1, "Task {1} was removed",                  false},
    {LogDescription::LOG_DESC_DEFAULT_TASK_ENABLED,  1, "Default task {1} was switched on",      false},
    {LogDescription::LOG_DESC_DEFAULT_TASK_DISABLED, 1, "Default task {1} was switched off",     false},
    {LogDescription::LOG_DESC_TASK_RENAMED,          2, "Task {1} was renamed to {2}",           false},
    {LogDescription::LOG_DESC_TASK_SETTING_CHANGED,  1, "The settings of task {1} were changed",
     false                                                                                            },
    {LogDescription::LOG_DESC_TASK_STARTED,          1, "Task {1} started",                      false},
    {LogDescription::LOG_DESC_TASK_DONE,             1, "Task {1} finished",                     false},
    {LogDescription::LOG_DESC_TASK_STOPPED,          1, "Task {1} was stopped before its end",   false},
    {LogDescription::LOG_DESC_TASK_FAILED,           1, "Task {1} failed",                       true },
    {LogDescription::LOG_DESC_ROTATED,               2, "Task {1} removed its old version {2}",  false},
    {LogDescription::LOG_DESC_FILE_FAILED,           2, "{2} could not be copied by task {1}",   true },
};

std::string Quoted(const std::string& name) { return '"' + NameInSentence(name) + '"'; }

std::string QuotedList(const Names& names) {
    std::string list;
    for (const std::string& name : names) list += (list.empty() ? "" : ", ") + Quoted(name);
    return list;
}

// In one pass: a name that looks like a place holder stays a name.
std::string Filled(std::string_view sentence, const Names& names) {
    std::string text;
    for (size_t i = 0; i < sentence.size(); ++i) {
        if (sentence[i] != '{') {
            text += sentence[i];
            continue;
        }
        text += Quoted(names[static_cast<size_t>(sentence[i + 1] - '1')]);
        i += 2;
    }
    return text;
}

std::string EventWords(const LogInfo& row) {
    return "event " + std::to_string(row.description_id) + " of task " +
           std::to_string(row.task_id);
}

std::string OutcomeIfAny(const LogInfo& row) {
    return row.error == 0 ? std::string() : " (" + OutcomeText(row.error) + ")";
}

std::string UnknownSentence(const LogInfo& row, const Names& names) {
    return "Unknown " + EventWords(row) + (names.empty() ? "" : ": " + QuotedList(names)) +
           OutcomeIfAny(row);
}

std::string DamagedSentence(const LogInfo& row) {
    return "Damaged record of " + EventWords(row) + ": \"" +
           Shortened(NameInSentence(row.description_param), DAMAGED_WIDTH) + '"' +
           OutcomeIfAny(row);
}

}  // namespace

std::string NameInSentence(std::string_view name) {
    std::string text;
    for (const char c : Printable(name)) {
        if (c == '"') text += '\\';
        text += c;
    }
    return text;
}

std::string LogSentence(const LogInfo& row) {
    const auto names = LogParameters(row.description_param);
    if (!names) return DamagedSentence(row);
    const auto* known = std::ranges::find(SENTENCES, row.description_id, &SentenceRow::id);
    if (known == std::end(SENTENCES)) return UnknownSentence(row, *names);
    if (names->size() != known->names) return DamagedSentence(row);
    return Filled(known->sentence, *names) +
           (known->has_outcome ? ": " + OutcomeText(row.error) : std::string());
}
