#include "platform/host/devices/device-state.h"

#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "platform/host/stand-in/stand-in.h"

namespace {

constexpr uint32_t STATE_SIZE = 2048;

/* The value of one line when the line is this key's; null otherwise. */
const char *value_of(const char *line, const char *key)
{
    const size_t key_length = strlen(key);
    line += strspn(line, " \t");
    if (strncmp(line, key, key_length) != 0) {
        return nullptr;
    }
    line += key_length;
    line += strspn(line, " \t");
    return *line == '=' ? line + 1 : nullptr;
}

void load_line(const char *line, device_value_st *row, uint32_t count)
{
    for (uint32_t i = 0; i < count; i++) {
        const char *value = value_of(line, row[i].m_key_ptr);
        if (value != nullptr) {
            row[i].m_value = static_cast<uint32_t>(strtoul(value, nullptr, 0));
        }
    }
}

} // namespace

void device_state_load(const char *device, device_value_st *row, uint32_t count)
{
    char path_a[STAND_IN_PATH_SIZE];
    char text_a[STATE_SIZE];
    if (!stand_in_path(path_a, STAND_IN_DEVICES, device) ||
        stand_in_read_file(path_a, text_a, sizeof(text_a)) < 0)
    {
        return;
    }
    char *rest = text_a;
    for (char *line = strsep(&rest, "\n"); line != nullptr; line = strsep(&rest, "\n")) {
        load_line(line, row, count);
    }
}

void device_state_save(const char *device, const device_value_st *row, uint32_t count)
{
    char path_a[STAND_IN_PATH_SIZE];
    if (!stand_in_path(path_a, STAND_IN_DEVICES, device)) {
        return;
    }
    char text_a[STATE_SIZE];
    uint32_t length = 0;
    for (uint32_t i = 0; i < count && length < sizeof(text_a); i++) {
        length += static_cast<uint32_t>(snprintf(text_a + length, sizeof(text_a) - length, "%s = %u\n",
                                                 row[i].m_key_ptr, row[i].m_value));
    }
    stand_in_replace_file(path_a, text_a, length < sizeof(text_a) ? length : sizeof(text_a) - 1);
}
