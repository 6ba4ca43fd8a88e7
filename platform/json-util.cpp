#include "platform/json-util.h"

#include <json/reader.h>
#include <json/value.h>
#include <json/writer.h>

#include <exception>
#include <memory>

#include "ipc/pobject.h"

void PObjectArrayToJson(const PObject& array, const std::string& key, Json::Value& json) {
    if (key.empty()) return;
    Json::Value& list = json[key] = Json::Value(Json::arrayValue);
    for (const PObject& element : array.AsArray()) list.append(Json::Value(element.AsString()));
}

void JsonToPObjectArray(const Json::Value& json, const std::string& key, PObject& array) {
    array = PObject::empty_array;
    if (key.empty() || !json.isObject() || !json[key].isArray()) return;
    for (const Json::Value& element : json[key]) {
        if (element.isString()) array.AsArray().emplace_back(element.asString());
    }
}

int ParseJson(const std::string& text, Json::Value& json) {
    Json::CharReaderBuilder builder;
    builder["collectComments"] = false;
    builder["failIfExtra"] = true;  // a text that goes on after its value is damaged
    builder["stackLimit"] = 1000;   // the parser is recursive
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    try {
        return reader->parse(text.data(), text.data() + text.size(), &json, nullptr) ? 0 : -1;
    } catch (const std::exception&) {
        return -1;  // the library throws for a text that is nested too deeply
    }
}

std::string WriteJson(const Json::Value& json) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    builder["commentStyle"] = "None";
    builder["emitUTF8"] = true;  // without it, bytes that are no UTF-8 would be replaced
    return Json::writeString(builder, json);
}
