#pragma once

#include <stdint.h>

/*
 * The state of a device stand-in: a file of "key = value" lines in the directory of devices, readable and
 * editable by a person. A missing file or line means the default.
 */
struct device_value_st
{
    const char *m_key_ptr;
    uint32_t m_value;
};

/* Reads the values that the file of this device names into the rows; the others stay. */
void device_state_load(const char *device, device_value_st *row, uint32_t count);

/* Writes all rows to the file of this device. */
void device_state_save(const char *device, const device_value_st *row, uint32_t count);
