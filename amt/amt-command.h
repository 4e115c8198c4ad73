#pragma once

#include <stdint.h>

/* The command ids, a constant for each row of the catalogue: AMT_READFLASH_CMD, AMT_READFLASH_RSPCMD ... */
#define AMT_COMMAND(id, name) constexpr uint8_t name = id;
#include "amt/amt-command.def"
#undef AMT_COMMAND

/*
 * The name of every command id, indexed by the id; "(undefined)" for an id that the catalogue does not have.
 * Every value of a byte is an index.
 */
extern const char *const amt_cmd_name_table[256];
