#include "preferences/store.h"

#include <fcntl.h>
#include <json/reader.h>

#include <algorithm>
#include <cerrno>
#include <memory>

#include "base/file.h"
#include "base/new_file.h"
#include "orvel/error_state.h"
#include "text.h"
#include "user_folder.h"

namespace orvel::cgi {
namespace {

constexpr const char* kStore = "/var/lib/vexo/preferences";
constexpr const char* kFile = "values.json";
constexpr int kVersion = 1;
constexpr int kDeepest = 16;
constexpr size_t kLongestName = 64;

int codeOf(int error) {
    return OrvParseErrnoToError(error, nullptr, nullptr);
}

bool parse(const std::string& text, Json::Value& value) try {
    Json::CharReaderBuilder builder;
    Json::CharReaderBuilder::strictMode(&builder.settings_);
    builder["stackLimit"] = kDeepest;
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    return reader->parse(text.data(), text.data() + text.size(), &value, nullptr) && value.isObject();
} catch (const Json::Exception&) {
    return false;  // the reader's way of reporting too many levels
}

bool isName(const std::string& name) {
    return !name.empty() && name.size() <= kLongestName && std::all_of(name.begin(), name.end(), [](char c) {
        return (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '_' || c == '.';
    });
}

int readFrom(const Descriptor& folder, const std::string& user, Json::Value& values) {
    values = Json::Value(Json::objectValue);
    const Descriptor file = openFile(folder.get(), kFile, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY);
    if (!file) return errno == ENOENT ? static_cast<int>(ORV_ERR_NONE) : codeOf(errno);
    std::string text;
    Json::Value kept;
    if (!readAll(file.get(), text, kMostPreferences)) return codeOf(errno);
    if (!parse(text, kept) || kept["version"] != kVersion || !kept["values"].isObject()) return ORV_ERR_GENERAL;
    if (kept["user"] == user) values = kept["values"];
    return ORV_ERR_NONE;
}

int writeTo(const Descriptor& folder, const std::string& user, const Json::Value& values) {
    Json::Value kept;
    kept["version"] = kVersion;
    kept["user"] = user;
    kept["values"] = values;
    std::string text;
    appendJson(kept, text);
    if (text.size() > kMostPreferences) return ORV_ERR_FILE_TOO_BIG;
    NewFile file(folder.get());
    const bool written = file.create(kFile, 0600) && writeAll(file.get(), text) && file.publish(kFile, true);
    return written ? static_cast<int>(ORV_ERR_NONE) : codeOf(errno);
}

}  // namespace

bool parsePreferences(const std::string& text, Json::Value& values) {
    if (!isUtf8(text) || !parse(text, values)) return false;
    const auto names = values.getMemberNames();
    return std::all_of(names.begin(), names.end(), isName);
}

int readPreferences(const std::string& user, Json::Value& values) {
    values = Json::Value(Json::objectValue);
    const Descriptor folder = openUserFolder(kStore, user, false);
    if (!folder) return errno == ENOENT ? static_cast<int>(ORV_ERR_NONE) : codeOf(errno);
    return readFrom(folder, user, values);
}

int changePreferences(const std::string& user, const Json::Value& changes, Json::Value& values) {
    const Descriptor folder = openUserFolder(kStore, user, true);
    // Two of the user's browsers change one after the other.
    if (!folder || !lockFile(folder.get(), LOCK_EX)) return codeOf(errno);
    const int code = readFrom(folder, user, values);
    if (code != ORV_ERR_NONE) return code;
    const Json::Value before = values;
    for (const std::string& name : changes.getMemberNames()) {
        if (changes[name].isNull()) {
            values.removeMember(name);
        } else {
            values[name] = changes[name];
        }
    }
    return values == before ? static_cast<int>(ORV_ERR_NONE) : writeTo(folder, user, values);
}

}  // namespace orvel::cgi
