// orvelctl completion: the table of commands as a function of bash, which zsh runs as well.
#include <algorithm>
#include <cstdio>
#include <cstring>
#include <map>
#include <string>

#include "arguments.h"
#include "command.h"

namespace orvel::ctl {
namespace {

// How bash completes what stands for such a value; "" for what it cannot know.
std::string completionOf(std::string_view value) {
    if (value == "USER") return "-u";
    if (value == "GROUP") return "-g";
    if (value == "FILE" || value == "FOLDER") return "-f";
    if (value.find('|') == std::string_view::npos) return "";
    std::string words(value);
    for (char& c : words) c = c == '|' ? ' ' : c;
    return "-W '" + words + "'";
}

void line(const std::string& pattern, const std::string& how) {
    if (!how.empty()) printf("        '%s') how=(%s) ;;\n", pattern.c_str(), how.c_str());
}

void addWord(std::map<std::string, std::string>& words, const std::string& key, const std::string& word) {
    std::string& list = words[key];
    if ((" " + list + " ").find(" " + word + " ") == std::string::npos) list += (list.empty() ? "" : " ") + word;
}

// What may stand behind the words that are there: names of commands and forms, and words of a kind.
void printPositions() {
    std::map<std::string, std::string> words;  // by what stands before
    std::map<std::string, std::string> kinds;
    for (const Command& command : commands()) {
        addWord(words, "", command.name);
        if (strcmp(command.name, "help") == 0) {
            for (const Command& other : commands()) addWord(words, "help", other.name);
        }
        for (const Form& form : command.forms) {
            std::string before = command.name, rest = form.words;
            const std::string name = nameOf(form);
            if (!name.empty()) {
                addWord(words, before, name);
                before += " " + name;
                rest.erase(0, name.size() + (rest.size() > name.size() ? 1 : 0));
            }
            for (size_t at = 0; rest.find('|') != std::string::npos && at < rest.size();) {
                const size_t end = std::min(rest.find('|', at), rest.size());
                addWord(words, before, rest.substr(at, end - at));
                at = end + 1;
            }
            if (rest.find('|') == std::string::npos && !completionOf(rest).empty()) kinds[before] = completionOf(rest);
        }
    }
    for (const auto& [before, list] : words) line(before, "-W '" + list + "'");
    for (const auto& [before, kind] : kinds) line(before, kind);
}

void printOptions() {
    for (const Command& command : commands()) {
        std::map<std::string, std::string> byForm;
        for (const Form& form : command.forms) {
            std::string& names = byForm[nameOf(form)];
            names = "--help";
            for (const Option& option : command.options) {
                if (takes(option, nameOf(form))) names += std::string(" ") + option.name;
            }
        }
        for (const auto& [form, names] : byForm) {
            const std::string key = std::string(command.name) + (form.empty() ? "" : " " + form);
            printf("        '%s '*) how=(-W '%s') ;;\n", key.c_str(), names.c_str());
        }
    }
}

void printBash() {
    std::string valued = "--root";
    for (const Command& command : commands()) {
        for (const Option& option : command.options) {
            if (*option.value != '\0') valued += std::string("|") + option.name;
        }
    }
    printf(
        "# Completes the command lines of orvelctl; printed by \"orvelctl completion bash\".\n"
        "_orvelctl() {\n"
        "    local current=${COMP_WORDS[COMP_CWORD]} previous=${COMP_WORDS[COMP_CWORD - 1]} before= command= i\n"
        "    local -a how=()\n"
        "    for ((i = 1; i < COMP_CWORD; i++)); do\n"
        "        case ${COMP_WORDS[i]} in\n"
        "        %s) ((i++)) ;;\n"
        "        -*) ;;\n"
        "        *) command=${command:-${COMP_WORDS[i]}} before=${before:+$before }${COMP_WORDS[i]} ;;\n"
        "        esac\n"
        "    done\n"
        "    case \"$command $previous\" in\n"
        "        ' --root') how=(-f) ;;\n",
        valued.c_str());
    for (const Command& command : commands()) {
        for (const Option& option : command.options) {
            if (*option.value == '\0') continue;
            const std::string how = completionOf(option.value);
            printf("        '%s %s') how=(%s) ;;\n", command.name, option.name, how.empty() ? "-W ''" : how.c_str());
        }
    }
    printf(
        "    *)\n"
        "        if [[ $current == -* ]]; then\n"
        "        case \"$before \" in\n"
        "        ' ') how=(-W '--root --help --version') ;;\n");
    printOptions();
    printf(
        "        esac\n"
        "        else\n"
        "        case $before in\n");
    printPositions();
    printf(
        "        esac\n"
        "        fi ;;\n"
        "    esac\n"
        "    COMPREPLY=()\n"
        "    local IFS=$'\\n'\n"
        "    [[ ${#how[@]} -eq 0 ]] || COMPREPLY=($(IFS=$' \\t\\n'; compgen \"${how[@]}\" -- \"$current\"))\n"
        "}\n"
        "complete -F _orvelctl orvelctl\n");
}

}  // namespace

int completion(const std::vector<std::string>& words) {
    const Arguments arguments(words, "completion", "", 1);
    const std::string& shell = arguments.position(0);
    if (shell != "bash" && shell != "zsh") throw UsageError("completion is for bash or zsh");
    if (shell == "zsh") printf("autoload -Uz bashcompinit && bashcompinit\n");
    printBash();
    return 0;
}

}  // namespace orvel::ctl
