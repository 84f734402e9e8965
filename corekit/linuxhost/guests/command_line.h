// What the command line of a virtual machine's process tells of its guest. It is a claim of that process, may hold any
// byte, and is bounded by its reader. Costs one pass over the text; nothing is kept.
#pragma once

#include "interface/types.h"

#include <string>
#include <string_view>
#include <vector>

// A network backend with the address of the card on it.
struct CommandNic {
    std::string interface;         // of ifname=; empty when the command line does not name it
    std::vector<u32> descriptors;  // of fd= and fds=
    u8 mac[6];
};

// Of -name NAME or -name guest=NAME; empty when there is none. `command` has its arguments ended by 0 each.
std::string CommandGuestName(std::string_view command);
constexpr size_t MAX_COMMAND_NICS = 1024;  // backends of a command line; further ones tell nothing
// The cards on tap backends that name their address, in their order.
std::vector<CommandNic> CommandNics(std::string_view command);
