// The only file that includes CLI11: it compiles slowly.
#include "Tools/CommandLine.h"

#include "Tools/CommandTexts.h"
#include "Tools/Failure.h"
#include "Tools/FaultKeeper.h"

#include "VexaVersion.h"

#include <CLI/CLI.hpp>

#include <algorithm>
#include <cstring>
#include <exception>
#include <memory>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::string_view kProgram = "vexatouch";

std::string optionNames(const OptionEntry& option) {
    std::string names(option.name);
    if (!option.shortName.empty()) {
        names += ',';
        names += option.shortName;
    }
    return names;
}

void addOption(CLI::App& app, const OptionEntry& option) {
    if (option.valueName.empty()) {
        app.add_flag(optionNames(option));
        return;
    }
    CLI::Option* added = app.add_option(optionNames(option));
    // A value in brackets is one value, and what follows a value is not another.
    added->expected(1)->allow_extra_args(false)->required(option.required);
    added->multi_option_policy(option.repeatable ? CLI::MultiOptionPolicy::TakeAll
                                                 : CLI::MultiOptionPolicy::Throw);
}

std::unique_ptr<CLI::App> makeParser(const Command& command) {
    auto app = std::make_unique<CLI::App>();
    app->set_help_flag("-h,--help");
    for (const OptionEntry& option : command.options) {
        addOption(*app, option);
    }
    for (const PositionalEntry& positional : command.positionals) {
        CLI::Option* added = app->add_option(std::string(positional.name));
        if (positional.repeatable) {
            added->expected(1, -1)->allow_extra_args();
        } else {
            added->expected(1)->allow_extra_args(false);
        }
        added->required(positional.required);
    }
    return app;
}

std::string commandNames() {
    std::string names;
    for (const Command* command : commandTable()) {
        names += names.empty() ? "" : ", ";
        names += command->name;
    }
    return names;
}

int usageError(Streams& streams, std::string_view command, std::string_view text) {
    std::string name(kProgram);
    if (!command.empty()) {
        name += ' ';
        name += command;
    }
    streams.error << name << ": " << text << "\nTry '" << name << " --help'.\n";
    return kExitUsage;
}

/// What is left over once the parser has taken all that it knows.
std::string unexpected(const std::vector<std::string>& left) {
    for (const std::string& each : left) {
        if (each.size() > 1 && each.starts_with('-')) {
            return "there is no option " + each.substr(0, each.find('='));
        }
    }
    return "one argument too many: " + left.front();
}

// Results that did not reach their destination are a failure like any other.
int flushed(Streams& streams, const FaultKeeper& fault, std::string_view command, int exitCode) {
    streams.out.flush();
    if (!streams.out.good()) {
        const int error = fault.error();
        streams.error << kProgram << ' ' << command << ": cannot write the results: "
                      << (error != 0 ? std::strerror(error) : "output stream failed") << '\n';
        return exitCode == kExitSuccess ? kExitFailure : exitCode;
    }
    return exitCode;
}

int runGlobal(std::span<const std::string> arguments, Streams& streams, const FaultKeeper& fault) {
    CLI::App app;
    app.set_help_flag("-h,--help");
    const CLI::Option* version = app.add_flag("--version");
    const CLI::Option* man = app.add_option("--generate-man")->expected(1);
    const CLI::Option* completion = app.add_flag("--generate-completion");
    try {
        app.parse(std::vector<std::string>(arguments.rbegin(), arguments.rend()));
    } catch (const CLI::CallForHelp&) {
        streams.out << overviewText();
        return flushed(streams, fault, "--help", kExitSuccess);
    } catch (const CLI::ExtrasError&) {
        return usageError(streams, "", unexpected(app.remaining()));
    } catch (const CLI::ParseError& error) {
        return usageError(streams, "", error.what());
    }
    if (version->count() > 0) {
        streams.out << kProgram << ' ' << versionText << '\n';
    } else if (man->count() > 0) {
        writeManPages(man->results().front());
    } else if (completion->count() > 0) {
        streams.out << completionScript();
    } else {
        return usageError(streams, "", "a command is required: " + commandNames());
    }
    return flushed(streams, fault, arguments.front(), kExitSuccess);
}

}  // namespace

int CommandLine::run(std::span<const std::string> arguments, Streams& streams) {
    std::string_view running;
    FaultKeeper fault(streams.out);
    try {
        if (arguments.empty() || arguments.front().starts_with('-')) {
            return runGlobal(arguments, streams, fault);
        }
        const Command* command = findCommand(arguments.front());
        if (command == nullptr) {
            return usageError(
                streams, "",
                "there is no command '" + arguments.front() + "', only " + commandNames());
        }
        running = command->name;
        const std::unique_ptr<CLI::App> parser = makeParser(*command);
        try {
            const auto rest = arguments.subspan(1);
            parser->parse(std::vector<std::string>(rest.rbegin(), rest.rend()));
        } catch (const CLI::CallForHelp&) {
            streams.out << helpText(*command);
            return flushed(streams, fault, running, kExitSuccess);
        } catch (const CLI::ExtrasError&) {
            return usageError(streams, running, unexpected(parser->remaining()));
        } catch (const CLI::ParseError& error) {
            return usageError(streams, running, error.what());
        }
        Arguments parsed;
        const auto take = [&](std::string_view name, std::string_view defaultValue) {
            const CLI::Option* option = parser->get_option(std::string(name));
            Arguments::Entry& entry = parsed.entries_[std::string(name)];
            entry.given = option->count() > 0;
            entry.values = option->results();
            entry.defaultValue = defaultValue;
        };
        for (const OptionEntry& option : command->options) {
            take(option.name, option.defaultValue);
        }
        for (const PositionalEntry& positional : command->positionals) {
            take(positional.name, {});
        }
        return flushed(streams, fault, running, command->run(parsed, streams));
    } catch (const UsageError& error) {
        return usageError(streams, running, error.what());
    } catch (const std::bad_alloc&) {
        throw;
    } catch (const std::exception& error) {
        streams.error << kProgram << (running.empty() ? "" : " ") << running << ": " << error.what()
                      << '\n';
        return kExitFailure;
    }
}

}  // namespace VexaTouch::Tools
