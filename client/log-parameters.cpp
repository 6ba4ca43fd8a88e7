#include "client/log-parameters.h"

#include <json/reader.h>
#include <json/value.h>

#include <exception>
#include <memory>

namespace {

std::unique_ptr<Json::CharReader> MakeReader() {
    Json::CharReaderBuilder builder;
    Json::CharReaderBuilder::strictMode(&builder.settings_);
    return std::unique_ptr<Json::CharReader>(builder.newCharReader());
}

bool ReadJson(const std::string& text, Json::Value& value) {
    // Making one takes longer than reading a row.
    thread_local const std::unique_ptr<Json::CharReader> reader = MakeReader();
    try {
        return reader->parse(text.data(), text.data() + text.size(), &value, nullptr);
    } catch (const std::exception&) {  // nested too deeply
        return false;
    }
}

}  // namespace

std::optional<std::vector<std::string>> LogParameters(const std::string& stored) {
    Json::Value array;
    if (!ReadJson(stored, array) || !array.isArray()) return std::nullopt;
    std::vector<std::string> texts;
    for (const Json::Value& text : array) {
        if (!text.isString()) return std::nullopt;
        texts.push_back(text.asString());
    }
    return texts;
}
