// Any share definitions: what comes out is sound, and nothing in them hides the section behind them.
#include "shares/share_definitions.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <optional>
#include <string>
#include <string_view>

#include "shares/share_options.h"

namespace {

void require(bool holds) {
    if (!holds) abort();
}

void checkShare(const vexo::DefinitionSection& section) {
    const vexo::ShareReading reading = vexo::readShare(section);
    if (!reading.share) return;
    require(reading.fault.empty() && section.fault.empty());
    require(vexo::normalRoot(reading.share->path) == reading.share->path);
    require(reading.share->name.find('/') == std::string::npos && !reading.share->name.empty());
    require(!reading.share->readOnly.empty() || !reading.share->readWrite.empty());
    // Whatever a user is called, the root stays two components below "/".
    const vexo::PathVariables hostile{"%S/..", "../..", "/", "", "%u"};
    const std::string replaced = vexo::replaceVariables(reading.share->path, hostile);
    const auto root = vexo::normalRoot(replaced);
    require(!root || (*root + '/').find("/../") == std::string::npos);
}

}  // namespace

// The input is the main text and, behind a byte 0xFF, the text of every included file.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string_view input(reinterpret_cast<const char*>(data), size);
    const size_t cut = input.find('\xFF');
    const std::string included(cut == std::string_view::npos ? std::string_view() : input.substr(cut + 1));
    const std::string text = std::string(input.substr(0, cut)) + "\n\n[last of all]\npath = /volume1/last\n";
    const vexo::Definitions definitions =
        vexo::parseDefinitions(text, [&](const std::string& file) -> std::optional<std::string> {
            if (file == "missing") return std::nullopt;
            return included;
        });
    bool seen = false;
    for (const vexo::DefinitionSection& section : definitions.sections) {
        seen = seen || vexo::foldedName(section.name) == "last of all";
        checkShare(section);
    }
    require(seen);
    static_cast<void>(vexo::splitList(input));
    return 0;
}
