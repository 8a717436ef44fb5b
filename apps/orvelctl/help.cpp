// orvelctl help: the table of commands for a terminal, and as a part of the manual page.
#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstring>

#include "arguments.h"
#include "command.h"

namespace orvel::ctl {
namespace {

// Above this many bytes a value that is one of many words is called WORD, and the words stand in the text.
constexpr size_t kLongValue = 24;

std::string usageLine(const Command& command, const Form& form) {
    std::string line = command.name;
    if (*form.words != '\0') line += std::string(" ") + form.words;
    const auto takesAny = [&form](const Option& option) { return takes(option, nameOf(form)); };
    const auto& options = command.options;
    return std::any_of(options.begin(), options.end(), takesAny) ? line + " [OPTION...]" : line;
}

std::string valueOf(const Option& option) {
    return strlen(option.value) > kLongValue ? "WORD" : option.value;
}

std::string textOf(const Option& option) {
    std::string text = option.text;
    if (*option.forms != '\0') text += std::string(" (") + option.forms + ")";
    if (strlen(option.value) <= kLongValue) return text;
    std::string words = option.value;
    for (size_t at = 0; (at = words.find('|', at)) != std::string::npos; at += 2) words.replace(at, 1, ", ");
    return text + ": " + words;
}

void printAll() {
    printf("usage: orvelctl [--root FOLDER] COMMAND ...\n       orvelctl --help | --version\n\n");
    for (const Command& command : commands()) printf("  %-12s%s\n", command.name, command.summary);
    printf(
        "\n\"orvelctl help COMMAND\" explains one of them. --root names the system root, the folder below which "
        "users,\n"
        "settings and share definitions lie; without it the variable VEXO_ROOT does, else it is the machine's own.\n"
        "Exit status: 0 done; 1 refused or failed, standard error says why; 2 not a command line of orvelctl.\n");
}

void printOne(const Command& command) {
    printf("%s: %s\n\n", command.name, command.summary);
    for (const Form& form : command.forms) {
        printf("  orvelctl %s\n", usageLine(command, form).c_str());
        if (*form.text != '\0') printf("      %s\n", form.text);
    }
    if (!command.options.empty()) printf("\n");
    for (const Option& option : command.options) {
        const std::string value = valueOf(option);
        const std::string left = option.name + (value.empty() ? "" : " " + value);
        printf("  %-26s%s\n", left.c_str(), textOf(option).c_str());
    }
    if (*command.notes != '\0') printf("\n%s\n", command.notes);
    if (!command.examples.empty()) printf("\nFor example:\n");
    for (const Example& example : command.examples) {
        printf("  %s\n", example.line);
        if (*example.text != '\0') printf("      %s\n", example.text);
    }
}

// Text of a manual page: what scdoc would take for a mark stands for itself.
std::string marked(const std::string& text) {
    std::string out;
    for (const char c : text) {
        if (strchr("\\*_<>~`[]", c) != nullptr) out += '\\';
        out += c;
    }
    return out;
}

void printManual() {
    for (const Command& command : commands()) {
        std::string summary = marked(command.summary);
        summary[0] = static_cast<char>(std::toupper(static_cast<unsigned char>(summary[0])));
        printf("## %s\n\n%s.\n\n", command.name, summary.c_str());
        for (const Form& form : command.forms) {
            printf("*orvelctl %s*%s\n", marked(usageLine(command, form)).c_str(), *form.text == '\0' ? "\n" : "");
            if (*form.text != '\0') printf("\t%s\n\n", marked(form.text).c_str());
        }
        for (const Option& option : command.options) {
            const std::string value = valueOf(option);
            printf("*%s*%s\n", option.name, value.empty() ? "" : (" " + marked(value)).c_str());
            printf("\t%s\n\n", marked(textOf(option)).c_str());
        }
        if (*command.notes != '\0') printf("%s\n\n", marked(command.notes).c_str());
        for (const Example& example : command.examples) {
            printf("```\n%s\n```\n\n", example.line);
            if (*example.text != '\0') printf("\t%s\n\n", marked(example.text).c_str());
        }
    }
}

}  // namespace

int help(const std::vector<std::string>& words) {
    const Arguments arguments(words, "help", "", 0, true);
    if (arguments.has("--man")) return printManual(), 0;
    if (arguments.positions().empty()) return printAll(), 0;
    const std::string& name = arguments.position(0);
    const Command* command = findCommand(name);
    if (command == nullptr || arguments.positions().size() > 1) throw UsageError("unknown command " + name);
    return printOne(*command), 0;
}

}  // namespace orvel::ctl
