// The users and groups of a device that an ordinary user runs.
#pragma once

#include <sys/types.h>

namespace corvexd::sim {

// Makes the user who runs this the root of `child`'s user namespace, with further users and groups
// behind it where the machine allots some to this user. Answers whether it does. When not even
// root could be mapped, it has said so and `*failed` is set.
bool map_users(pid_t child, bool* failed);

}  // namespace corvexd::sim
