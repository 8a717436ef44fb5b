// Tables of cases that are nothing but data: tests/data/NAME.json holds one array of rows, each an array of fields;
// "//" begins a comment.
#ifndef ORVEL_TESTS_SUPPORT_TABLE_H
#define ORVEL_TESTS_SUPPORT_TABLE_H

#include <gtest/gtest.h>
#include <json/value.h>

#include <string>
#include <tuple>
#include <utility>
#include <vector>

namespace support {

// The rows of a table: for (const auto& [path, type] : Rows<const char*, int>{{"/", 0}, {"/volume1", 2}}) ...
template <class... Fields>
using Rows = std::vector<std::tuple<Fields...>>;

// One row, where several short ones stand on a line: Rows<const char*, int>{row("/", 0), row("/volume1", 2)}.
template <class... Fields>
std::tuple<Fields...> row(Fields... fields) {
    return {std::move(fields)...};
}

// A list of items that are short enough to share lines.
template <class Item, class... Items>
std::vector<Item> listOf(Items... items) {
    return {Item(std::move(items))...};
}

// The rows of a table, which stay in memory. A table that is missing, malformed or empty fails the test.
const Json::Value& tableOf(const std::string& name);

template <class Field>
struct TableField {
    // A text holds a number that is easier to read in another base: "0x8100", "0644".
    static Field of(const Json::Value& value) {
        if (value.isString()) return static_cast<Field>(std::stoll(value.asString(), nullptr, 0));
        return static_cast<Field>(value.asInt64());
    }
};
template <>
struct TableField<bool> {
    static bool of(const Json::Value& value) { return value.asBool(); }
};
template <>
struct TableField<std::string> {
    static std::string of(const Json::Value& value) { return value.asString(); }
};
template <>
struct TableField<const char*> {
    static const char* of(const Json::Value& value) { return value.isNull() ? nullptr : value.asCString(); }
};
template <class Item>
struct TableField<std::vector<Item>> {
    static std::vector<Item> of(const Json::Value& value) {
        std::vector<Item> items;
        for (const Json::Value& item : value) items.push_back(TableField<Item>::of(item));
        return items;
    }
};

template <class... Fields, size_t... At>
std::tuple<Fields...> rowOf(const Json::Value& row, std::index_sequence<At...> /*fields*/) {
    EXPECT_EQ(row.size(), sizeof...(Fields)) << row.toStyledString();
    return {TableField<Fields>::of(row[static_cast<Json::ArrayIndex>(At)])...};
}

// The rows of a table with fields of these types: for (const auto& [path, type] : rowsOf<const char*, int>("paths"))
// ...
template <class... Fields>
Rows<Fields...> rowsOf(const std::string& name) {
    Rows<Fields...> rows;
    for (const Json::Value& row : tableOf(name))
        rows.push_back(rowOf<Fields...>(row, std::index_sequence_for<Fields...>()));
    return rows;
}

// The same as records of a kind that such fields make.
template <class Record, class... Fields>
std::vector<Record> recordsOf(const std::string& name) {
    std::vector<Record> records;
    for (const auto& row : rowsOf<Fields...>(name))
        records.push_back(std::apply([](const auto&... fields) { return Record{fields...}; }, row));
    return records;
}

}  // namespace support

#endif
