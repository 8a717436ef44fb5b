// Long lists of alternatives that are asked in one test, whose cost does not grow with them. Pure.
#ifndef VEXO_LINUX_INDEX_ALTERNATIVES_H
#define VEXO_LINUX_INDEX_ALTERNATIVES_H

#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_set>

namespace vexo::fileindex {

class TextSet {
 public:
    void add(std::string_view text) { texts_.emplace(text); }
    [[nodiscard]] bool has(std::string_view text) const { return texts_.find(text) != texts_.end(); }
    [[nodiscard]] bool empty() const { return texts_.empty(); }

 private:
    struct Hash {
        using is_transparent = void;
        size_t operator()(std::string_view text) const { return std::hash<std::string_view>()(text); }
    };
    std::unordered_set<std::string, Hash, std::equal_to<>> texts_;
};

// What stands behind the last dot of a name, in the form of orvel::appendComparable and valid until `buffer` changes;
// none where there is no dot.
[[nodiscard]] std::optional<std::string_view> extensionOf(std::string_view name, std::string& buffer);

// Patterns "*.xyz" without another wildcard.
class Endings {
 public:
    // What stands behind the ".", in the form of orvel::appendComparable.
    void add(std::string_view ending);
    [[nodiscard]] bool match(std::string_view name) const;
    // Whether names of this extension, as extensionOf gives it, may match.
    [[nodiscard]] bool mayMatch(std::string_view extension) const { return extensions_.has(extension); }

 private:
    TextSet endings_, extensions_;
    size_t longest_ = 0;
};

// Folders whose records are meant, "" for the share's root.
class FolderSet {
 public:
    void add(std::string_view folder, bool below) { (below ? below_ : direct_).add(folder); }
    [[nodiscard]] bool holds(std::string_view path) const;

 private:
    TextSet below_, direct_;
};

}  // namespace vexo::fileindex

#endif
