#pragma once

#include "Tools/CommandTable.h"

#include <string>

/// The texts that are made from the command table.
namespace VexaTouch::Tools {

/// `vexatouch --help`: what the program is and its subcommands.
std::string overviewText();
/// `vexatouch COMMAND --help`.
std::string helpText(const Command& command);
/// A man page in roff, of the program or of one subcommand.
std::string overviewManPage();
std::string manPage(const Command& command);
/// Writes vexatouch.1 and one vexatouch-COMMAND.1 each into a folder, which is made if it is not
/// there. Throws Failure.
void writeManPages(const std::string& folder);
/// A bash completion script.
std::string completionScript();

}  // namespace VexaTouch::Tools
