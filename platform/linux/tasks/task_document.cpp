#include "tasks/task_document.h"

#include <json/reader.h>
#include <json/writer.h>

#include <cmath>
#include <memory>

namespace vexo {
namespace {

constexpr unsigned kDeepest = 64;  // levels, the document's own included

// Whether the reader takes it: it counts plain values as levels, too (`levels` may be there yet), and knows no number
// that is not finite.
bool isReadable(const Json::Value& value, unsigned levels) {
    if (levels == 0) return false;
    if (value.isDouble()) return std::isfinite(value.asDouble());
    if (!value.isArray() && !value.isObject()) return true;
    for (const Json::Value& member : value) {
        if (!isReadable(member, levels - 1)) return false;
    }
    return true;
}

Json::Value textOf(const Json::Value& object, const char* key) {
    const Json::Value& member = object[key];
    return member.isString() ? member : Json::Value("");
}

long long numberOf(const Json::Value& object, const char* key) {
    const Json::Value& member = object[key];
    return member.isInt64() ? member.asInt64() : 0;
}

Worker workerOf(const Json::Value& value) {
    if (!value.isObject()) return {};
    const Json::Value &pid = value["pid"], &start = value["start"];
    if (!pid.isInt() || !start.isUInt64()) return {};
    return {pid.asInt(), start.asUInt64(), textOf(value, "boot").asString()};
}

Json::Value valueOf(const Worker& worker) {
    Json::Value value;
    value["pid"] = worker.pid;
    value["start"] = Json::UInt64{worker.start};
    value["boot"] = worker.boot;
    return value;
}

bool parse(const std::string& text, Json::Value& root) try {
    Json::CharReaderBuilder builder;
    Json::CharReaderBuilder::strictMode(&builder.settings_);
    builder["stackLimit"] = kDeepest;
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    return reader->parse(text.data(), text.data() + text.size(), &root, nullptr);
} catch (const Json::Exception&) {
    return false;  // the reader's way of reporting too many levels
}

}  // namespace

std::optional<std::string> buildTaskDocument(const TaskDocument& document) {
    if (!isReadable(document.properties, kDeepest - 1)) return std::nullopt;
    Json::Value root;
    root["created"] = Json::Int64{document.created};
    root["finished"] = document.finished;
    root["worker"] = valueOf(document.worker);
    root["properties"] = document.properties;
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    std::string text = Json::writeString(builder, root);
    if (text.size() > kMaxTaskDocument) return std::nullopt;
    return text;
}

std::optional<TaskDocument> parseTaskDocument(const std::string& text) {
    Json::Value root;
    if (text.size() > kMaxTaskDocument || !parse(text, root) || !root.isObject()) return std::nullopt;
    TaskDocument document;
    document.created = numberOf(root, "created");
    document.finished = root["finished"].isBool() && root["finished"].asBool();
    document.worker = workerOf(root["worker"]);
    if (root["properties"].isObject()) document.properties = root["properties"];
    return document;
}

}  // namespace vexo
