#include "text.h"

#include <json/value.h>
#include <json/writer.h>

#include "support/testing.h"

using namespace orvel::cgi;

namespace {

TEST(Text, OnlyWellFormedSequencesPass) {
    for (const auto& [bytes, shown] : Rows<std::string, std::string>{
             {"", ""},
             {"plain text that is longer than one word", "plain text that is longer than one word"},
             {"\u00E9\u20AC\U0001F600 \uFFFF", "\u00E9\u20AC\U0001F600 \uFFFF"},
             {"\xF4\x8F\xBF\xBF", "\xF4\x8F\xBF\xBF"},
             {"eight by\xE9tes", "eight by\uFFFDtes"},
             {"\xC0\xAF", "\uFFFD\uFFFD"},                      // overlong
             {"\xE0\x9F\xBF", "\uFFFD\uFFFD\uFFFD"},            // overlong
             {"\xF0\x8F\xBF\xBF", "\uFFFD\uFFFD\uFFFD\uFFFD"},  // overlong
             {"\xED\xA0\x80", "\uFFFD\uFFFD\uFFFD"},            // surrogate
             {"\xF4\x90\x80\x80", "\uFFFD\uFFFD\uFFFD\uFFFD"},  // above U+10FFFF
             {"\xE2\x82", "\uFFFD\uFFFD"},                      // cut short
             {"\xE2\x82z", "\uFFFD\uFFFDz"},
             {"\x80\xFF", "\uFFFD\uFFFD"},
         }) {
        EXPECT_EQ(readable(bytes), shown) << shown;
        EXPECT_EQ(isUtf8(bytes), bytes == shown) << shown;
    }
}

TEST(Text, JsonIsThatOfTheLibraryWithoutBlanks) {
    Json::Value whole;
    for (const char* key : {"", "b", "a \"quoted\" \\key\x1f"}) {
        Json::Value& list = whole[key];
        for (const double real : {0.0, 1.0, -2.5, 1e300, 1.0 / 3}) list.append(real);
        list.append(Json::Value::minLargestInt);
        list.append(Json::Value::maxLargestUInt);
        for (const bool flag : {false, true}) list.append(flag);
        for (const auto type : {Json::nullValue, Json::stringValue, Json::arrayValue, Json::objectValue})
            list.append(Json::Value(type));
        list.append(Json::Value(std::string("\0\b\f\n\r\t\x7f \u20AC/", 11)));
        list.append(list);
    }
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    builder["emitUTF8"] = true;
    std::string text;
    appendJson(whole, text);
    EXPECT_EQ(text, Json::writeString(builder, whole));
}

TEST(Text, PercentCodingReturnsEveryByte) {
    std::string all;
    for (int byte = 1; byte < 256; ++byte) all += static_cast<char>(byte);
    EXPECT_EQ(percentDecode(percentEncode(all)), all);
    EXPECT_EQ(percentEncode("/a b~.\xE9"), "/a%20b~.%E9");
    EXPECT_EQ(percentDecode("+%e9%E9"), "+\xE9\xE9");
    for (const char* broken : {"%", "%1", "x%g1", "%1g", "%00", "a%0"}) EXPECT_EQ(percentDecode(broken), std::nullopt);
    EXPECT_EQ(percentDecode(std::string_view("a\0b", 3)), std::nullopt);
}

}  // namespace
