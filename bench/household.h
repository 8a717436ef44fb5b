// The names of a household's files, a million or fewer, and a system root whose share they are in.
#ifndef ORVEL_BENCH_HOUSEHOLD_H
#define ORVEL_BENCH_HOUSEHOLD_H

#include <array>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <random>
#include <string>
#include <vector>

#include "vexo/index.h"

namespace bench {

constexpr const char* kShare = "photo";

// The files of a household: photographs, documents of several words, music; the same at each run.
class Files {
 public:
    Files() {
        static constexpr std::array<const char*, 24> syllables = {
            "ba",  "re", "ti",  "mo", "lun", "ker",       "sa",  "vi",  "do", "pha", "gro", "nel",
            "ist", "ur", "che", "wa", "zo",  "f\xC3\xBC", "jel", "que", "ro", "mi",  "ten", "al"};
        for (int i = 0; i < 4000; ++i) {
            std::string word;
            for (unsigned j = 0; j < 2 + random_() % 3; ++j) word += syllables[random_() % syllables.size()];
            words_.push_back(word);
        }
    }
    // Calls `take` with `count` records.
    template <class Take>
    void make(int count, Take take) {
        std::string folder;
        for (int i = 0; i < count; ++i) {
            if (i % 60 == 0) folder = word() + std::to_string(i / 6000) + "/" + word() + "_" + std::to_string(i / 60);
            const std::string name = nameOf(i);
            const std::string path = folder + "/" + name;
            const std::string extension = name.substr(name.rfind('.') + 1);
            __tag_FI_FILE_INFO_DATA data{};
            data.szShareRoot = "/volume1/photo";
            data.szShare = kShare;
            data.szName = name.c_str();
            data.szPath = path.c_str();
            data.szParent = folder.c_str();
            data.szExtension = extension.c_str();
            data.szPermission = "rw-r--r--";
            data.szOwner = "alice";
            data.szGroup = "users";
            data.size = static_cast<int64_t>(random_() % 100000000);
            data.created = data.changed = data.accessed = data.modified =
                1700000000 + static_cast<int>(random_() % 50000000);
            data.mode = 0644;
            data.uid = 20001;
            data.gid = 20100;
            take(data);
        }
    }

 private:
    const std::string& word() { return words_[random_() % words_.size()]; }
    std::string nameOf(int i) {
        switch (random_() % 3) {
            case 0:
                return "IMG_" + std::to_string(20080000 + i % 150000) + "_" + std::to_string(i) + ".JPG";
            case 1:
                return word() + " " + word() + (random_() % 2 == 0 ? "" : " final") + " " + std::to_string(i % 1000) +
                       ".pdf";
            default:
                return std::to_string(i % 20) + " - " + word() + " " + word() + ".mp3";
        }
    }
    std::mt19937 random_{1};
    std::vector<std::string> words_;
};

// From here on the platform works below FOLDER/root.
inline void prepareRoot(const std::string& folder) {
    const std::string root = folder + "/root";
    std::filesystem::create_directories(root + "/etc/vexo");
    std::ofstream(root + "/etc/vexo/shares.conf") << "[photo]\npath = /volume1/photo\nvexo:index = yes\n";
    setenv("VEXO_ROOT", root.c_str(), 1);
}

}  // namespace bench

#endif
