// Condition trees as SQL. Pure.
#ifndef VEXO_LINUX_INDEX_CONDITION_H
#define VEXO_LINUX_INDEX_CONDITION_H

#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "index/index_statement.h"
#include "vexo/index.h"

namespace vexo::fileindex {

// How the values of a tree are read.
struct Reading {
    bool ofSearch = false;     // paths begin with the share's name, and no "*" in them is a wildcard
    bool accessHolds = false;  // conditions on the access time hold
    bool ofCriteria = false;   // patterns for names are cut as the criterion's; Condition::trigrams is wanted
};

// Records directly in a folder, or at any depth below it.
struct Folder {
    std::string path;
    bool below;
};

// A test of which many alternatives are asked as one.
struct PlainTest {
    enum class Kind { kEnding, kDirect, kBelow };
    Kind kind;
    std::string text;  // of Endings or FolderSet
};

// What a tree says. `sql` is one parenthesised expression over the columns of a record; `values` are bound in order.
struct Condition {
    std::string sql;
    std::vector<Value> values = {};
    // Only records of these folders can satisfy the tree; empty: no such limit is known.
    std::optional<std::vector<Folder>> folders = {};
    // A full-text expression over trigrams of names that every record satisfying the tree fits; empty: none is known.
    std::optional<std::string> trigrams = {};
    // Set where the tree is this test alone.
    std::optional<PlainTest> plain = {};
    // The name of every record satisfying the tree fits one of each of these; a Value of patterns or endings.
    std::vector<std::vector<Value>> names = {};
};

// Whether a record of this name may satisfy the condition, as far as names tell.
[[nodiscard]] bool fitsNames(const Condition& condition, std::string_view name);
// The same by what extensionOf gives for the name, and whether names without an extension never satisfy it.
[[nodiscard]] bool mayHaveExtension(const Condition& condition, std::string_view extension);
[[nodiscard]] bool asksForExtension(const Condition& condition);

// Null `tree` holds for every record. Nothing, with the slot filled (0x0D00), for columns and comparisons that do not
// exist or do not go together, and for a tree that is too deep or large or a cycle.
[[nodiscard]] std::optional<Condition> readCondition(const __tag_FI_SQL_COND* tree, const Reading& reading);

// Both conditions.
[[nodiscard]] Condition both(Condition a, Condition b);

// A node's value as its column takes it. A number that does not fit becomes the largest or the smallest, what is none
// 0.
[[nodiscard]] Value valueOf(const __tag_FI_SQL_COND& node);

}  // namespace vexo::fileindex

#endif
