#include "Tools/CommandTexts.h"

#include "Tools/Failure.h"

#include "VexaVersion.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::string_view kProgram = "vexatouch";
constexpr std::string_view kPurpose =
    "Runs the service of a small touch surface, plays, shows, converts and makes recordings of it";
constexpr std::string_view kOverview =
    "A recording holds every input of the surface's service: raw input reports and settings, each "
    "with its time. It is a JSON document; - as FILE reads it from standard input. Results go to "
    "standard output, status and faults to standard error.";
constexpr std::size_t kWidth = 80;
constexpr std::size_t kIndent = 26;  // column of the second column in help texts

constexpr OptionEntry kHelpOption = {
    .name = "--help", .shortName = "-h", .help = "Show the help text"};
constexpr OptionEntry kVersionOption = {.name = "--version", .help = "Show the version"};

/// The text broken at spaces so that no line is longer than `width`; each line begins with
/// `indent` spaces, the first one is taken to stand there already.
void appendWrapped(std::string& out, std::string_view text, std::size_t indent) {
    std::size_t column = indent;
    bool first = true;
    while (!text.empty()) {
        const std::size_t end = std::min(text.find(' '), text.size());
        const std::string_view word = text.substr(0, end);
        text.remove_prefix(std::min(end + 1, text.size()));
        if (!first && column + 1 + word.size() > kWidth) {
            out += '\n';
            out.append(indent, ' ');
            column = indent;
        } else if (!first) {
            out += ' ';
            ++column;
        }
        out += word;
        column += word.size();
        first = false;
    }
    out += '\n';
}

/// Calls `paragraph` for each paragraph and `literal` for each block of lines kept as they are.
template <typename Paragraph, typename Literal>
void forEachBlock(std::string_view text, Paragraph&& paragraph, Literal&& literal) {
    while (!text.empty()) {
        const std::size_t end = std::min(text.find("\n\n"), text.size());
        const std::string_view block = text.substr(0, end);
        text.remove_prefix(std::min(end + 2, text.size()));
        if (block.starts_with("  ")) {
            literal(block);
        } else {
            paragraph(block);
        }
    }
}

std::string optionTerm(const OptionEntry& option) {
    std::string term;
    if (!option.shortName.empty()) {
        term += option.shortName;
        term += ", ";
    }
    term += option.name;
    if (!option.valueName.empty()) {
        term += ' ';
        term += option.valueName;
    }
    return term;
}

std::string optionHelp(const OptionEntry& option) {
    std::string help(option.help);
    if (option.repeatable) {
        help += "; may be given more than once";
    }
    if (!option.defaultValue.empty()) {
        help += " (default: ";
        help += option.defaultValue;
        help += ')';
    }
    return help;
}

void appendTerm(std::string& out, std::string_view term, std::string_view help) {
    out += "  ";
    out += term;
    if (term.size() + 4 > kIndent) {
        out += '\n';
        out.append(kIndent, ' ');
    } else {
        out.append(kIndent - 2 - term.size(), ' ');
    }
    appendWrapped(out, help, kIndent);
}

std::string synopsis(const Command& command) {
    std::string line(kProgram);
    line += ' ';
    line += command.name;
    for (const OptionEntry& option : command.options) {
        if (option.required) {
            line += ' ';
            line += option.shortName.empty() ? option.name : option.shortName;
            line += ' ';
            line += option.valueName;
        }
    }
    line += " [OPTION]...";
    for (const PositionalEntry& positional : command.positionals) {
        line += positional.required ? " " : " [";
        line += positional.name;
        line += positional.repeatable ? "..." : "";
        line += positional.required ? "" : "]";
    }
    return line;
}

std::vector<OptionEntry> withHelp(const Command& command) {
    std::vector<OptionEntry> options(command.options.begin(), command.options.end());
    options.push_back(kHelpOption);
    return options;
}

// roff: a backslash is an escape, a hyphen of a command must stay one, a line that begins with a
// point or an apostrophe would be a request.
std::string roff(std::string_view text) {
    std::string out;
    bool lineStart = true;
    for (const char c : text) {
        if (lineStart && (c == '.' || c == '\'')) {
            out += "\\&";
        }
        if (c == '\\') {
            out += "\\e";
        } else if (c == '-') {
            out += "\\-";
        } else if (c == '\'') {
            out += "\\(aq";
        } else if (c == '`') {
            out += "\\(ga";
        } else if (c == '^') {
            out += "\\(ha";
        } else if (c == '~') {
            out += "\\(ti";
        } else {
            out += c;
        }
        lineStart = c == '\n';
    }
    return out;
}

void appendManHead(std::string& page, std::string_view name, std::string_view summary) {
    std::string title(name);
    std::ranges::transform(title, title.begin(), [](char c) {
        return c >= 'a' && c <= 'z' ? static_cast<char>(c - 'a' + 'A') : c;
    });
    page += ".TH \"" + roff(title) + "\" \"1\" \"\" \"" + roff(std::string(kProgram)) + " " +
            std::string(versionText) + "\" \"User Commands\"\n";
    page += ".SH NAME\n" + roff(name) + " \\- " + roff(summary) + "\n";
}

void appendManTerm(std::string& page, std::string_view term, std::string_view help) {
    page += ".TP\n.B " + roff(term) + "\n" + roff(help) + ".\n";
}

void appendManLiteral(std::string& page, std::string_view text) {
    page += ".PP\n.nf\n" + roff(text) + "\n.fi\n";
}

void writeFile(const std::filesystem::path& path, std::string_view text) {
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    file << text;
    file.close();
    if (!file) {
        throw Failure(path.string() + ": cannot write: " + std::strerror(errno));
    }
}

/// A line of bash that offers what the command prints, names with spaces kept whole.
std::string offer(const std::string& command) {
    return "mapfile -t COMPREPLY < <(" + command + " -- \"$current\")";
}

std::string offerWords(const std::string& words) {
    return offer("compgen -W '" + words + "'");
}

/// What bash offers for a value.
std::string completionOf(const OptionEntry& option) {
    switch (option.kind) {
        case ValueKind::File:
            return offer("compgen -f");
        case ValueKind::Choice: {
            const bool goesOn = option.choices.ends_with('=') || option.choices.ends_with('.');
            return (goesOn ? "compopt -o nospace 2>/dev/null; " : "") +
                   offerWords(std::string(option.choices));
        }
        case ValueKind::Text:
            break;
    }
    return "COMPREPLY=()";
}

}  // namespace

std::string overviewText() {
    std::string text = "Usage: vexatouch COMMAND [ARGUMENT]...\n\n";
    text += kPurpose;
    text += ".\n\n";
    appendWrapped(text, kOverview, 0);
    text += "\nCommands:\n";
    for (const Command* command : commandTable()) {
        appendTerm(text, command->name, command->summary);
    }
    text += "\nOptions:\n";
    for (const OptionEntry& option : {kHelpOption, kVersionOption}) {
        appendTerm(text, optionTerm(option), optionHelp(option));
    }
    text += "\nExamples:\n";
    for (const Command* command : commandTable()) {
        text += "  ";
        text += command->examples.front().command;
        text += '\n';
    }
    text += "\n'vexatouch COMMAND --help' tells more about a command.\n";
    return text;
}

std::string helpText(const Command& command) {
    std::string text = "Usage: " + synopsis(command) + "\n\n";
    appendWrapped(text, std::string(command.summary) + '.', 0);
    forEachBlock(
        command.description,
        [&](std::string_view paragraph) {
            text += '\n';
            appendWrapped(text, paragraph, 0);
        },
        [&](std::string_view literal) {
            text += '\n';
            text += literal;
            text += '\n';
        });
    if (!command.positionals.empty()) {
        text += "\nArguments:\n";
    }
    for (const PositionalEntry& positional : command.positionals) {
        appendTerm(text, positional.name, positional.help);
    }
    text += "\nOptions:\n";
    for (const OptionEntry& option : withHelp(command)) {
        appendTerm(text, optionTerm(option), optionHelp(option));
    }
    text += "\nExit codes:\n";
    for (const ExitCodeEntry& exitCode : command.exitCodes) {
        appendTerm(text, std::to_string(exitCode.code), exitCode.meaning);
    }
    text += "\nExamples:\n";
    for (const ExampleEntry& example : command.examples) {
        text += "  ";
        text += example.command;
        text += "\n      ";
        appendWrapped(text, example.effect, 6);
    }
    return text;
}

std::string overviewManPage() {
    std::string page;
    appendManHead(page, kProgram, kPurpose);
    page += ".SH SYNOPSIS\n.B vexatouch\n.I COMMAND\n[\\fIARGUMENT\\fR]...\n";
    page += ".SH DESCRIPTION\n" + roff(kOverview) + "\n";
    page += ".SH COMMANDS\n";
    for (const Command* command : commandTable()) {
        appendManTerm(page, std::string(kProgram) + '-' + std::string(command->name) + "(1)",
                      command->summary);
    }
    page += ".SH OPTIONS\n";
    for (const OptionEntry& option : {kHelpOption, kVersionOption}) {
        appendManTerm(page, optionTerm(option), optionHelp(option));
    }
    page += ".SH EXIT STATUS\n";
    for (const ExitCodeEntry& exitCode : usualExitCodes) {
        appendManTerm(page, std::to_string(exitCode.code), exitCode.meaning);
    }
    page += ".SH EXAMPLES\n";
    for (const Command* command : commandTable()) {
        const ExampleEntry& example = command->examples.front();
        page += ".TP\n.B " + roff(example.command) + "\n" + roff(example.effect) + ".\n";
    }
    return page;
}

std::string manPage(const Command& command) {
    std::string page;
    const std::string name = std::string(kProgram) + '-' + std::string(command.name);
    appendManHead(page, name, command.summary);
    page += ".SH SYNOPSIS\n.B " + roff(synopsis(command)) + "\n";
    page += ".SH DESCRIPTION\n" + roff(command.summary) + ".\n";
    forEachBlock(
        command.description,
        [&](std::string_view paragraph) { page += ".PP\n" + roff(paragraph) + "\n"; },
        [&](std::string_view literal) { appendManLiteral(page, literal); });
    if (!command.positionals.empty()) {
        page += ".SH ARGUMENTS\n";
    }
    for (const PositionalEntry& positional : command.positionals) {
        appendManTerm(page, positional.name, positional.help);
    }
    page += ".SH OPTIONS\n";
    for (const OptionEntry& option : withHelp(command)) {
        appendManTerm(page, optionTerm(option), optionHelp(option));
    }
    page += ".SH EXIT STATUS\n";
    for (const ExitCodeEntry& exitCode : command.exitCodes) {
        appendManTerm(page, std::to_string(exitCode.code), exitCode.meaning);
    }
    page += ".SH EXAMPLES\n";
    for (const ExampleEntry& example : command.examples) {
        page += ".TP\n.B " + roff(example.command) + "\n" + roff(example.effect) + ".\n";
    }
    page += ".SH SEE ALSO\n.BR vexatouch (1)";
    for (const Command* other : commandTable()) {
        if (other != &command) {
            page +=
                ",\n.BR " + roff(std::string(kProgram) + '-' + std::string(other->name)) + " (1)";
        }
    }
    page += '\n';
    return page;
}

void writeManPages(const std::string& folder) {
    std::error_code error;
    std::filesystem::create_directories(folder, error);
    if (error) {
        throw Failure(folder + ": cannot make the folder: " + error.message());
    }
    const std::filesystem::path root(folder);
    writeFile(root / "vexatouch.1", overviewManPage());
    for (const Command* command : commandTable()) {
        writeFile(root / ("vexatouch-" + std::string(command->name) + ".1"), manPage(*command));
    }
}

std::string completionScript() {
    std::string commands = "--help --version";
    for (const Command* command : commandTable()) {
        commands += ' ';
        commands += command->name;
    }
    std::string script =
        "# bash completion of vexatouch, made by `vexatouch --generate-completion`\n"
        "_vexatouch() {\n"
        "    local current=${COMP_WORDS[COMP_CWORD]} previous=${COMP_WORDS[COMP_CWORD - 1]}\n"
        "    if ((COMP_CWORD == 1)); then\n"
        "        " +
        offerWords(commands) +
        "\n"
        "        return\n"
        "    fi\n"
        "    case ${COMP_WORDS[1]} in\n";
    for (const Command* command : commandTable()) {
        script += "        " + std::string(command->name) + ")\n            case $previous in\n";
        std::string options;
        for (const OptionEntry& option : withHelp(*command)) {
            options += options.empty() ? "" : " ";
            options += option.name;
            if (option.valueName.empty()) {
                continue;
            }
            script += "                ";
            if (!option.shortName.empty()) {
                script += std::string(option.shortName) + " | ";
            }
            script += std::string(option.name) + ") " + completionOf(option) + "; return ;;\n";
        }
        script +=
            "            esac\n"
            "            if [[ $current == -* ]]; then\n"
            "                " +
            offerWords(options) +
            "\n"
            "                return\n"
            "            fi\n"
            "            ;;\n";
    }
    script +=
        "        *) return ;;\n"
        "    esac\n"
        "    " +
        offer("compgen -f") +
        "\n"
        "}\n"
        "complete -o filenames -F _vexatouch vexatouch\n";
    return script;
}

}  // namespace VexaTouch::Tools
