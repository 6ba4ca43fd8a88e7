// Answers as JSON, for scripts. What a terminal would obey (client/text.h) is written as an escape:
// a reader gets the same text.
#pragma once

#include <json/value.h>

#include <string>
#include <string_view>

class PObject;

// A value of the daemon. Bytes of a string that are no UTF-8 become U+FFFD; integers that stand for
// a truth value under one of the daemon's known keys become true and false.
[[nodiscard]] Json::Value ToJson(const PObject& value);
// Bytes as a JSON string, with U+FFFD for what is no UTF-8.
[[nodiscard]] Json::Value JsonText(std::string_view bytes);

// Writes the value to standard output, indented, with a line end.
void PrintJson(const Json::Value& value);
// The value in one line, without a line end.
[[nodiscard]] std::string JsonLine(const Json::Value& value);
