// What the command-line tool says of itself: help, its exit status, completion.
#include "apps/program.h"
#include "criteria.h"
#include "support/testing.h"

namespace {

using Words = std::vector<std::string>;

std::string helpOf(const std::string& command) {
    const support::Finished finished = orvelctl({"help", command});
    EXPECT_EQ(finished.status, 0) << command;
    return finished.output;
}

Words commandNames() {
    Words names;
    std::istringstream lines(orvelctl({"--help"}).output);
    for (std::string line; std::getline(lines, line);) {
        if (line.starts_with("  ") && line[2] != ' ') names.push_back(line.substr(2, line.find(' ', 2) - 2));
    }
    return names;
}

TEST(Orvelctl, ExplainsEveryCommandWithExamplesThatItTakes) {
    const Words names = commandNames();
    EXPECT_GE(names.size(), 5U);
    for (const std::string& name : names) {
        const std::string help = helpOf(name);
        EXPECT_EQ(orvelctl({name, "--help"}).output, help);
        std::istringstream lines(help.substr(0, help.find("For example:")));
        Words options;
        for (std::string word; lines >> word;) options.push_back(word);
        std::istringstream examples(help.substr(std::min(help.find("For example:"), help.size())));
        for (std::string line; std::getline(examples, line);) {
            std::istringstream words(line);
            std::string word, command;
            words >> word >> command;
            if (word != "orvelctl" || command != name) continue;
            while (words >> word) {
                if (!word.starts_with("--")) continue;
                EXPECT_NE(std::find(options.begin(), options.end(), word), options.end()) << line;
            }
        }
    }
}

TEST(Orvelctl, OffersEverySearchCriterion) {
    const std::string help = helpOf("search");
    for (std::string name : orvel::cgi::criterionNames()) {
        std::replace(name.begin(), name.end(), '_', '-');
        EXPECT_NE(help.find("  --" + name + " "), std::string::npos) << name;
    }
}

TEST(Orvelctl, TellsByItsStatusHowItWent) {
    for (const auto& [words, status] : rowsOf<Words, int>("apps/orvelctl_status"))
        EXPECT_EQ(orvelctl(words).status, status) << ::testing::PrintToString(words);
}

TEST(Orvelctl, CompletesCommandLines) {
    for (const auto& [typed, offered] : rowsOf<std::string, std::string>("apps/orvelctl_completion")) {
        const std::string script = std::string("set -f; . <(") + ORVELCTL + " completion bash); line='" + typed +
                                   "'; COMP_WORDS=($line); [[ $line != *' ' ]] || COMP_WORDS+=(''); set +f; " +
                                   "COMP_CWORD=$((${#COMP_WORDS[@]} - 1)); _orvelctl; echo -n \"${COMPREPLY[*]}\"";
        EXPECT_EQ(support::runProgram({"/bin/bash", "-c", script}).output, offered) << typed;
    }
}

}  // namespace
