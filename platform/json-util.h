// Lists of strings between messages and JSON, and JSON text that never throws. Threads: any.
#pragma once

#include <json/forwards.h>

#include <string>

class PObject;

// Sets json[key] to a new array with the elements' texts (PObject::AsString). An empty key does
// nothing. `json` must be an object or null; `array` of another kind gives an empty array.
void PObjectArrayToJson(const PObject& array, const std::string& key, Json::Value& json);
// Makes `array` an array of the strings in json[key]: empty when the key is empty, or when there is
// no such member or it is no array. Elements of other kinds are skipped.
void JsonToPObjectArray(const Json::Value& json, const std::string& key, PObject& array);

// Parses text from outside. Returns 0, or -1 when it is no JSON text as a whole, or is nested more
// than 1000 levels deep; `json` is then unspecified.
[[nodiscard]] int ParseJson(const std::string& text, Json::Value& json);
// One line without blanks and without a newline at the end. Names keep their bytes, also those that
// are no UTF-8, and ParseJson() gives them back.
[[nodiscard]] std::string WriteJson(const Json::Value& json);
