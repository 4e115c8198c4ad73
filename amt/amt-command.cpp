#include "amt/amt-command.h"

namespace {

/* A switch, so that an id with two rows does not compile. */
constexpr const char *name_of(uint32_t id)
{
    switch (id) {
#define AMT_COMMAND(id, name)                                                                                \
    case id:                                                                                                 \
        return #name;
#include "amt/amt-command.def"
#undef AMT_COMMAND
    default:
        return "(undefined)";
    }
}

} // namespace

#define NAME_4(id)  name_of(id), name_of((id) + 1), name_of((id) + 2), name_of((id) + 3)
#define NAME_16(id) NAME_4(id), NAME_4((id) + 4), NAME_4((id) + 8), NAME_4((id) + 12)
#define NAME_64(id) NAME_16(id), NAME_16((id) + 16), NAME_16((id) + 32), NAME_16((id) + 48)

constexpr const char *const amt_cmd_name_table[256] = {NAME_64(0x00), NAME_64(0x40), NAME_64(0x80),
                                                       NAME_64(0xC0)};
