// What the platform has to say to whoever sits in front of a program.
#pragma once

#include <string>
#include <vector>

namespace admin {

// The platform's messages since the last call, in their order: each one line that says what is
// wrong and what to do. From the first call on they are kept for this, and none goes to the system
// log. Where another header of this contract speaks of a message, it is one of these.
std::vector<std::string> take_messages();

}  // namespace admin
