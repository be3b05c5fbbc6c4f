#pragma once

#include <sys/types.h>

namespace VexaTouch::Tools::Daemon {

/// Whether the login manager knows the user on a seat, in the foreground or not. Never where there
/// is no login manager.
bool isOnASeat(uid_t user);

}  // namespace VexaTouch::Tools::Daemon
