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

void checkShare(const vexo::DefinitionSection& section, const vexo::LimitValues& global) {
    const vexo::ShareReading reading = vexo::readShare(section, global);
    // There is a share, or a reason why there is none.
    require(reading.share.has_value() == (reading.fault.empty() && reading.off.empty() && reading.closings.empty()));
    if (!reading.share) return;
    require(section.fault.empty());
    require(vexo::normalRoot(reading.share->path) == reading.share->path);
    require(reading.share->name.find('/') == std::string::npos && !reading.share->name.empty());
    require(!reading.share->readOnly.empty() || !reading.share->readWrite.empty());
    // Whatever a user is called, the root goes down from "/".
    const vexo::PathVariables hostile{"%S/..", "../..", "/", "", "%u", "/.."};
    const auto replaced = vexo::replaceVariables(reading.share->path, hostile);
    const auto root = replaced ? vexo::normalRoot(*replaced) : std::nullopt;
    require(!root || (*root + '/').find("/../") == std::string::npos);
    static_cast<void>(vexo::homesOf(*reading.share, "%S"));
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
        checkShare(section, definitions.global);
        static_cast<void>(vexo::placeText(definitions, section.place));
    }
    require(seen || definitions.sections.size() == 10000);
    static_cast<void>(vexo::splitList(input));
    return 0;
}
