#include "support/testing.h"

#include <json/reader.h>

#include <fstream>

namespace support {

const Json::Value& tableOf(const std::string& name) {
    static auto& tables = *new std::map<std::string, Json::Value>;
    Json::Value& rows = tables[name];
    if (rows.isNull()) {
        std::ifstream file(std::string(TEST_DATA) + "/" + name + ".json");
        std::string errors;
        EXPECT_TRUE(parseFromStream(Json::CharReaderBuilder(), file, &rows, &errors)) << name << errors;
        EXPECT_TRUE(rows.isArray() && !rows.empty()) << name;
    }
    return rows;
}

}  // namespace support
