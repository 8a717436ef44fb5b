#include "operation/member_path.h"

#include <algorithm>

namespace orvel::cgi {
namespace {

std::vector<std::string> split(std::string_view path) {
    std::vector<std::string> components;
    while (!path.empty()) {
        const std::size_t end = std::min(path.find('/'), path.size());
        const std::string_view component = path.substr(0, end);
        if (!component.empty() && component != ".") components.emplace_back(component);
        path.remove_prefix(std::min(end + 1, path.size()));
    }
    return components;
}

}  // namespace

std::optional<std::vector<std::string>> memberComponents(std::string_view name) {
    if (name.starts_with('/')) return std::nullopt;
    std::vector<std::string> components = split(name);
    const bool climbs = std::find(components.begin(), components.end(), "..") != components.end();
    if (climbs || components.empty()) return std::nullopt;
    return components;
}

bool staysInside(std::string_view linkText, std::size_t depth) {
    if (linkText.empty() || linkText.starts_with('/')) return false;
    const std::vector<std::string> components = split(linkText);
    const auto isClimb = [](const std::string& component) { return component == ".."; };
    const auto down = std::find_if_not(components.begin(), components.end(), isClimb);
    return static_cast<std::size_t>(down - components.begin()) <= depth &&
           std::none_of(down, components.end(), isClimb);
}

}  // namespace orvel::cgi
