#include "client/log-output.h"

#include <ctime>

#include "client/json-output.h"
#include "client/log-kind.h"
#include "client/log-parameters.h"
#include "client/log-sentence.h"
#include "client/text.h"
#include "db/log-info.h"
#include "utils/error-code.h"

namespace {

// "2026-11-21T19:04:33+01:00"
std::string IsoTime(time_t time) {
    tm local{};
    char text[64];
    if (localtime_r(&time, &local) == nullptr) return {};
    std::string iso(text, strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%S%z", &local));
    if (iso.size() > 2) iso.insert(iso.size() - 2, ":");
    return iso;
}

Json::Value ParametersJson(const LogInfo& row) {
    const auto names = LogParameters(row.description_param);
    if (!names) return {};
    Json::Value array(Json::arrayValue);
    for (const std::string& name : *names) array.append(JsonText(name));
    return array;
}

}  // namespace

std::string LogLine(const LogInfo& row, const Terminal& terminal) {
    constexpr size_t KIND_WIDTH = 4;
    const Colour colour = LogKindColour(row.log_type);
    return terminal.Paint(Colour::GREY, TimeText(row.timestamp)) + "  " +
           terminal.Paint(colour, Padded(LogKindName(row.log_type), KIND_WIDTH)) + "  " +
           terminal.Paint(colour, LogSentence(row)) + '\n';
}

Json::Value LogJson(const LogInfo& row) {
    Json::Value json(Json::objectValue);
    json["time"] = IsoTime(row.timestamp);
    json["timestamp"] = row.timestamp;
    json["task_id"] = Json::UInt64{row.task_id};
    json["type"] = LogKindName(row.log_type);
    json["description_id"] = row.description_id;
    json["parameters"] = ParametersJson(row);
    json["error"] = row.error;
    json["error_text"] = ErrorText(row.error);
    json["sentence"] = JsonText(LogSentence(row));
    return json;
}
