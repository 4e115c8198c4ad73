#pragma once

#include <stdint.h>

#include "platform/host/devices/device-state.h"

/* How the argument of a request is to be understood, and shown in the record. */
enum device_argument_en
{
    DEVICE_ARGUMENT_OUT,    /* points to what the request fills in */
    DEVICE_ARGUMENT_SCREEN, /* points to the framebuffer's variable information */
    DEVICE_ARGUMENT_VALUE,  /* is the value itself */
    DEVICE_ARGUMENT_INT     /* points to an int32_t */
};

/* A row's m_value_index for a request that keeps no single value. */
constexpr uint32_t DEVICE_NO_VALUE = ~0U;

struct device_st;

/* Serves a request: fd is the device's descriptor, argument is not null. 0 or a negative error number. */
typedef int32_t (*device_serve_func)(device_st *device, int fd, void *argument);

/* One request. A request of one value stores it in the device's state, if it is at most m_limit. */
struct device_request_st
{
    unsigned long m_number;
    const char *m_name_ptr;
    device_argument_en m_argument;
    uint32_t m_value_index;
    uint32_t m_limit;
    device_serve_func m_serve_ptr; /* null for a request of one value */
};

/* One device: the file that stands for its node, its name in the record and for its state, its requests. */
struct device_st
{
    const char *m_path_ptr;
    const char *m_name_ptr;
    const char *m_state_name_ptr;
    device_value_st *m_value_ptr;
    uint32_t m_value_count;
    const device_request_st *m_request_ptr;
    uint32_t m_request_count;
};

device_st *device_framebuffer();
device_st *device_console();
device_st *device_camera();
