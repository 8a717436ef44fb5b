// Lists a folder through the library as a program behind the web server does: sorted by name, all properties, as JSON.
//   orvel_list FOLDER LIMIT     the first LIMIT entries through a JSON tree; 0: all of them, record by record as text
//   orvel_list FOLDER stages    what the steps cost, told from listings that ask for one step more each
#include <json/json.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "orvel/file_info.h"
#include "orvel/listing.h"

namespace {

constexpr int kAllProperties = 0x7F;
constexpr size_t kFlushAt = 64 * 1024;

struct Request {
    int additional;
    const char* sortBy;
    unsigned long limit;
};

std::list<DIRENTRY_INFO> list(const char* folder, const Request& request) {
    OrvEnum listing;
    std::list<DIRENTRY_INFO> entries;
    unsigned long total = 0;
    if (!listing.OrvLibDirEntryListEnum("/bench", folder, request.sortBy, request.additional, 0, request.limit, true,
                                        DIR_ENTRY_TYPE_ALL, {}, entries, &total)) {
        fprintf(stderr, "the folder cannot be listed\n");
        exit(1);
    }
    return entries;
}

void flush(std::string& text, int fd) {
    for (size_t written = 0; written < text.size();) {
        const ssize_t part = write(fd, text.data() + written, text.size() - written);
        if (part < 0) exit(1);
        written += static_cast<size_t>(part);
    }
    text.clear();
}

void writeTree(const std::list<DIRENTRY_INFO>& entries, int fd) {
    Json::Value reply;
    Json::Value& items = reply["data"]["items"] = Json::arrayValue;
    for (const auto& entry : entries) DumpFileInfo(kAllProperties, entry, items.append(Json::objectValue));
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    builder["emitUTF8"] = true;
    std::string text = Json::writeString(builder, reply);
    flush(text, fd);
}

void writeText(const std::list<DIRENTRY_INFO>& entries, int fd) {
    std::string text = "{\"data\":{\"items\":[";
    for (const auto& entry : entries) {
        AppendFileInfoText(kAllProperties, entry, text);
        text += ',';
        if (text.size() >= kFlushAt) flush(text, fd);
    }
    text.back() = ']';
    text += "}}";
    flush(text, fd);
}

// Processor time, which other work of the machine distorts least.
double medianMilliseconds(const std::function<void()>& work) {
    const auto now = [] {
        timespec time;
        clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &time);
        return static_cast<double>(time.tv_sec) * 1e3 + static_cast<double>(time.tv_nsec) / 1e6;
    };
    std::vector<double> times;
    for (int round = 0; round < 9; ++round) {
        const double start = now();
        work();
        times.push_back(now() - start);
    }
    std::nth_element(times.begin(), times.begin() + 4, times.end());
    return times[4];
}

void stages(const char* folder) {
    const auto listing = [&](const Request& request) { return medianMilliseconds([&] { list(folder, request); }); };
    const double names = listing({0, nullptr, 1});
    const double statuses = listing({kAllProperties, nullptr, 1});
    const double page = listing({kAllProperties, "name", 100});
    const double sorted = listing({0, "name", 0}) - listing({0, nullptr, 0});
    const double records = listing({kAllProperties, nullptr, 0});
    const auto entries = list(folder, {kAllProperties, "name", 0});
    FILE* null = fopen("/dev/null", "w");
    const double text = medianMilliseconds([&] { writeText(entries, fileno(null)); });
    printf("  reading the names                    %7.2f ms\n", names);
    printf("  status of every entry                %7.2f ms\n", statuses - names);
    printf("  folding, picking a page of 100       %7.2f ms\n", page - statuses);
    printf("  or: folding, sorting everything      %7.2f ms\n", sorted);
    printf("  records of every entry               %7.2f ms\n", records - statuses);
    printf("  text of every record                 %7.2f ms\n", text);
    fclose(null);
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 3) return 2;
    if (strcmp(argv[2], "stages") == 0) {
        stages(argv[1]);
        return 0;
    }
    const unsigned long limit = strtoul(argv[2], nullptr, 10);
    const auto entries = list(argv[1], {kAllProperties, "name", limit});
    if (limit == 0) {
        writeText(entries, STDOUT_FILENO);
    } else {
        writeTree(entries, STDOUT_FILENO);
    }
    fflush(nullptr);
    _exit(0);  // the reply is out: records are not given back one by one at the end of a request
}
