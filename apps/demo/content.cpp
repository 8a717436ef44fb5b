#include "content.h"

#include <algorithm>
#include <initializer_list>

#include "picture.h"

namespace orvel::demo {
namespace {

constexpr time_t kDay = 86400;
constexpr time_t kStart = 1325376000;  // 2012-01-01

// The same numbers for every demo: what is shown somewhere can be looked up in another one.
class Numbers {
 public:
    uint64_t below(uint64_t limit) {
        state_ = state_ * 6364136223846793005U + 1442695040888963407U;
        return (state_ >> 33) % limit;
    }

 private:
    uint64_t state_ = 20120101;
};

std::string digits(int number, size_t width) {
    const std::string text = std::to_string(number);
    return std::string(width - std::min(width, text.size()), '0') + text;
}

void fillYear(Tree& tree, int year, Numbers& numbers) {
    const std::string folder = std::to_string(year);
    tree.folder(folder);
    for (int month = 1; month <= 12; month += 3) {
        std::string quarter = folder + "/";
        quarter += digits(month, 2);
        tree.folder(quarter);
        for (int i = 1; i <= 8; ++i) {
            const time_t day = kStart + (year - 2012) * 365 * kDay + month * 30 * kDay;
            tree.file(quarter + "/P" + digits(year * 10000 + month * 100 + i, 8) + ".jpg",
                      200000 + static_cast<int64_t>(numbers.below(6000000)),
                      day + static_cast<time_t>(numbers.below(28)) * kDay);
        }
    }
}

void fillRecycleBin(Tree& tree) {
    tree.folder("#recycle");
    tree.folder("#recycle/old drafts");
    tree.file("#recycle/thrown away.txt", 120, kStart + 900 * kDay);
    tree.file("#recycle/old drafts/draft 1.odt", 48000, kStart + 950 * kDay);
}

// Pictures that can be looked at, unlike the others, which are empty space.
void fillLandscapes(Tree& tree) {
    static constexpr const char* kTitles[] = {"Early morning", "Noon",        "Blue hour",   "Meadow",
                                              "Dusk",          "First frost", "Heather",     "After the rain",
                                              "Harvest",       "Far hills",   "North slope", "Last light"};
    tree.folder("Landscapes");
    int number = 0;
    for (const char* title : kTitles) {
        tree.textFile("Landscapes/" + std::string(title) + ".png", landscape(number++));
    }
}

}  // namespace

void fillPhoto(Tree& tree) {
    static constexpr const char* kExtensions[] = {"jpg", "JPG", "png", "heic", "mp4", "raw"};
    Numbers numbers;
    for (int i = 1; i <= 180; ++i) {
        // Sizes of every magnitude up to 2 GB; some are empty.
        const int64_t size =
            i % 30 == 0 ? 0 : static_cast<int64_t>(numbers.below(uint64_t{1} << (8 + numbers.below(24))));
        tree.file("IMG_" + digits(i, 4) + "." + kExtensions[numbers.below(6)], size,
                  kStart + static_cast<time_t>(numbers.below(4500 * uint64_t{kDay})));
    }
    for (int year = 2012; year <= 2024; ++year) fillYear(tree, year, numbers);
    fillLandscapes(tree);
    fillRecycleBin(tree);
}

void fillMusic(Tree& tree) {
    Numbers numbers;
    for (const char* album : {"Chamber Music", "Night Trains", "Søndag Morgen"}) {
        tree.folder(album);
        for (int track = 1; track <= 9; ++track) {
            tree.file(std::string(album) + "/" + digits(track, 2) + " Track.flac",
                      9000000 + static_cast<int64_t>(numbers.below(30000000)),
                      kStart + static_cast<time_t>(numbers.below(4000)) * kDay);
        }
    }
}

void fillProjects(Tree& tree) {
    tree.folder("house");
    tree.file("house/plan.pdf", 350000, kStart + 3000 * kDay);
    tree.textFile("notes.md", "# Notes\n\nBob is shut out of this share.\n");
    tree.folder("private of alice", 0700);
    tree.file("private of alice/diary.txt", 4000, kStart + 4000 * kDay, 0600);
    tree.folder("read only", 0555);
    // Links are never listed; only those that stay within the share can be followed.
    tree.link("plans", "house");
    tree.link("way out", "/etc");
    tree.owner(tree.ids().bob);
    tree.file("left by bob.txt", 77, kStart + 2500 * kDay, 0640);
    tree.owner(tree.ids().admin);
    tree.folder("board", 0);
    tree.owner(tree.ids().alice);
    fillRecycleBin(tree);
}

void fillWorldwide(Tree& tree) {
    int day = 0;
    for (const char* name : {"Straße nach Übersee.txt",
                             "Ελληνικά.txt",
                             "Привет, мир.txt",
                             "İstanbul ılık.txt",
                             "照片 二〇二四年.jpg",
                             "日本語のファイル.md",
                             "한국어 문서.docx",
                             "مرحبا بالعالم.txt",
                             "שלום עולם.txt",
                             "हिन्दी.txt",
                             "\U0001F389 party \U0001F388.png",
                             "\U0001F468\u200D\U0001F469\u200D\U0001F467 family.jpg",
                             "looks like \u202Etxt.exe",
                             "caf\u00E9 composed.txt",
                             "cafe\u0301 decomposed.txt",
                             "<img src=x onerror=alert(1)>.txt",
                             "<b>bold.txt",
                             "&amp; &lt;tag&gt;.txt",
                             "single ' double \" back `.txt",
                             "back\\slash.txt",
                             "line\nbreak.txt",
                             "tab\there.txt",
                             "bell\a.txt",
                             " blank before.txt",
                             "blank after ",
                             "-rf",
                             "percent%20sign%2F.txt",
                             "plus+sign.txt",
                             "#hash.txt",
                             "question?.txt",
                             "semicolon;ampersand&.txt",
                             "star*.txt",
                             ".hidden",
                             "no extension",
                             "two..dots",
                             "caf\xE9 in Latin-1.txt",
                             "\xFF\xFE not text.bin",
                             "half a character \xE2\x82.txt"}) {
        ++day;
        tree.file(name, 10 + day, kStart + day * 30 * kDay);
    }
    tree.file(std::string(251, 'w') + ".txt", 255, kStart);
    tree.folder("папка");
    tree.file("папка/внутри.txt", 5, kStart);
    tree.folder("dossier \xE9t\xE9");
    tree.file("dossier \xE9t\xE9/dedans.txt", 5, kStart);
}

void fillWarehouse(Tree& tree) {
    Numbers numbers;
    for (int i = 0; i < 20000; ++i) {
        tree.file("item-" + digits(i, 5) + ".dat", static_cast<int64_t>(numbers.below(1000000)),
                  kStart + static_cast<time_t>(numbers.below(4000)) * kDay);
    }
}

void fillHomes(Tree&) {}

void fillSample(Tree& tree) {
    tree.folder("folder");
    tree.textFile("folder/inside.txt", "A file in a folder.\n");
    tree.textFile("readme.txt", "A share of the demo appliance.\n");
    tree.file("data.bin", 1 << 20, kStart + 3500 * kDay);
}

}  // namespace orvel::demo
