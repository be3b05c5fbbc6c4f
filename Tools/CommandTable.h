#pragma once

#include "Tools/Streams.h"

#include <array>
#include <map>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {

inline constexpr int kExitSuccess = 0;
inline constexpr int kExitFailure = 1;
inline constexpr int kExitUsage = 2;

/// What a value on the command line is, so that the shell can complete it.
enum class ValueKind : unsigned char {
    Text,    ///< nothing to offer
    File,    ///< a path
    Choice,  ///< one of, or beginning like, the words in `choices`
};

struct PositionalEntry {
    std::string_view name;  ///< "FILE"
    std::string_view help;  ///< one sentence without its full stop
    bool required = true;
    ValueKind kind = ValueKind::File;
    bool repeatable = false;  ///< the last one only
};

struct OptionEntry {
    std::string_view name;               ///< "--speed"
    std::string_view shortName = {};     ///< "-o", or empty
    std::string_view valueName = {};     ///< "FACTOR"; empty for a switch
    std::string_view help;               ///< one sentence or more, without the last full stop
    std::string_view defaultValue = {};  ///< what Arguments::value gives when it is not there
    bool repeatable = false;
    bool required = false;
    ValueKind kind = ValueKind::Text;
    std::string_view choices = {};  ///< words separated by spaces
};

struct ExampleEntry {
    std::string_view command;  ///< the whole line to type
    std::string_view effect;   ///< what it does, without its full stop
};

struct ExitCodeEntry {
    int code;
    std::string_view meaning;
};

/// What was given on the command line of one subcommand, by the names of its table entry.
/// Asking for a name that the table does not hold is a mistake of the program and throws
/// std::logic_error.
class Arguments {
public:
    /// Whether the option or positional argument was given.
    [[nodiscard]] bool given(std::string_view name) const;
    /// The (last) value given, else the table's default; empty when there is neither.
    [[nodiscard]] std::string value(std::string_view name) const;
    /// All values in the order given.
    [[nodiscard]] const std::vector<std::string>& values(std::string_view name) const;

private:
    friend class CommandLine;
    struct Entry {
        std::vector<std::string> values;
        std::string defaultValue;
        bool given = false;
    };
    const Entry& entry(std::string_view name) const;

    std::map<std::string, Entry, std::less<>> entries_;
};

/// A subcommand: the one description that its parsing, help, man page and completion are made of.
struct Command {
    std::string_view name;
    std::string_view summary;      ///< one line, without a full stop
    std::string_view description;  ///< paragraphs separated by empty lines; lines that begin with
                                   ///< two spaces are kept as they are
    std::span<const PositionalEntry> positionals;
    std::span<const OptionEntry> options;
    std::span<const ExitCodeEntry> exitCodes;
    std::span<const ExampleEntry> examples;
    /// Does the work and returns the exit code. Throws Failure or UsageError.
    int (*run)(const Arguments& arguments, Streams& streams);
};

/// Exit codes of a subcommand that has nothing special to say.
inline constexpr std::array<ExitCodeEntry, 3> usualExitCodes = {{
    {kExitSuccess, "done"},
    {kExitFailure, "failed; one line on standard error says with what and why"},
    {kExitUsage, "the command line is wrong"},
}};

/// All subcommands in the order of the help text.
std::span<const Command* const> commandTable();
/// The subcommand of that name, or null.
const Command* findCommand(std::string_view name);

}  // namespace VexaTouch::Tools
