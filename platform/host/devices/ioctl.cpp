#include <dlfcn.h>
#include <errno.h>
#include <stdarg.h>
#include <stdio.h>
#include <string.h>
#include <sys/ioctl.h>
#include <sys/stat.h>

#include "platform/host/devices/device.h"
#include "platform/host/stand-in/stand-in.h"
#include "platform/include/device-requests.h"

/*
 * Preloaded, this ioctl() answers the requests of the device stand-ins, which are regular files under the
 * names of the device nodes. Every other request, and every request on anything but these files, goes on to
 * the next ioctl().
 */

namespace {

typedef int (*ioctl_func)(int fd, unsigned long request, ...);

ioctl_func next_ioctl()
{
    static const ioctl_func next = reinterpret_cast<ioctl_func>(dlsym(RTLD_NEXT, "ioctl"));
    return next;
}

__attribute__((constructor)) void find_next()
{
    next_ioctl();
}

const device_request_st *find_request(const device_st *device, unsigned long number)
{
    for (uint32_t i = 0; i < device->m_request_count; i++) {
        /* Some C libraries widen the request from a signed int. */
        if (static_cast<uint32_t>(device->m_request_ptr[i].m_number) == static_cast<uint32_t>(number)) {
            return &device->m_request_ptr[i];
        }
    }
    return nullptr;
}

bool is_open_on(int fd, const char *path)
{
    struct stat opened;
    struct stat named;
    return fstat(fd, &opened) == 0 && S_ISREG(opened.st_mode) && stat(path, &named) == 0 &&
           opened.st_dev == named.st_dev && opened.st_ino == named.st_ino;
}

uint32_t value_of(const device_request_st *request, const void *argument)
{
    if (request->m_argument == DEVICE_ARGUMENT_VALUE) {
        const uintptr_t value = reinterpret_cast<uintptr_t>(argument);
        return value > UINT32_MAX ? UINT32_MAX : static_cast<uint32_t>(value);
    }
    return static_cast<uint32_t>(*static_cast<const int32_t *>(argument));
}

int32_t serve(device_st *device, const device_request_st *request, int fd, void *argument)
{
    device_state_load(device->m_state_name_ptr, device->m_value_ptr, device->m_value_count);
    int32_t status = 0;
    if (request->m_serve_ptr != nullptr) {
        status = request->m_serve_ptr(device, fd, argument);
    } else {
        const uint32_t value = value_of(request, argument);
        if (value > request->m_limit) {
            return -EINVAL;
        }
        device->m_value_ptr[request->m_value_index].m_value = value;
    }
    if (status == 0 && request->m_argument != DEVICE_ARGUMENT_OUT) {
        device_state_save(device->m_state_name_ptr, device->m_value_ptr, device->m_value_count);
    }
    return status;
}

/* The argument as the record shows it, with the comma before it. */
void describe(const device_request_st *request, const void *argument, char *text, size_t capacity)
{
    text[0] = '\0';
    switch (request->m_argument) {
    case DEVICE_ARGUMENT_SCREEN:
        snprintf(text, capacity, ", yoffset=%u", static_cast<const fb_var_screeninfo *>(argument)->yoffset);
        break;
    case DEVICE_ARGUMENT_VALUE:
    case DEVICE_ARGUMENT_INT:
        snprintf(text, capacity, ", %d", static_cast<int32_t>(value_of(request, argument)));
        break;
    case DEVICE_ARGUMENT_OUT:
        break;
    }
}

int answer_request(device_st *device, const device_request_st *request, int fd, void *argument)
{
    if (argument == nullptr && request->m_argument != DEVICE_ARGUMENT_VALUE) {
        errno = EFAULT;
        return -1;
    }
    stand_in_answer_st answer;
    int32_t status = stand_in_take_answer(request->m_name_ptr, &answer);
    int32_t error = status < 0 ? stand_in_error_number(&answer, EIO) : 0;
    if (error == 0) {
        const int32_t served = serve(device, request, fd, argument);
        status = served < 0 ? -1 : status;
        error = -served;
    }
    char argument_a[64];
    describe(request, argument, argument_a, sizeof(argument_a));
    if (error == 0) {
        stand_in_record("ioctl(%s, %s%s) = %d", device->m_name_ptr, request->m_name_ptr, argument_a, status);
        return status;
    }
    stand_in_record("ioctl(%s, %s%s) = -1 %s", device->m_name_ptr, request->m_name_ptr, argument_a,
                    strerrorname_np(error));
    errno = error;
    return -1;
}

} // namespace

STAND_IN_INTERFACE int ioctl(int fd, unsigned long number, ...) noexcept
{
    va_list args;
    va_start(args, number);
    void *argument = va_arg(args, void *);
    va_end(args);
    device_st *const device_a[] = {device_framebuffer(), device_console(), device_camera()};
    for (device_st *device : device_a) {
        const device_request_st *request = find_request(device, number);
        if (request == nullptr) {
            continue;
        }
        const int saved_errno = errno;
        if (stand_in_setting(STAND_IN_DEVICES) != nullptr && is_open_on(fd, device->m_path_ptr)) {
            errno = saved_errno;
            return answer_request(device, request, fd, argument);
        }
        errno = saved_errno;
        break;
    }
    return next_ioctl()(fd, number, argument);
}
