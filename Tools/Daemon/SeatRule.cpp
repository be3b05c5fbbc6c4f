#include "Tools/Daemon/SeatRule.h"

#include <systemd/sd-login.h>

namespace VexaTouch::Tools::Daemon {

bool isOnASeat(uid_t user) {
    return sd_uid_get_seats(user, 0, nullptr) > 0;
}

}  // namespace VexaTouch::Tools::Daemon
