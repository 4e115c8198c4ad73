/*
 * Requests of the handset's device nodes. The framebuffer's, the console's and the camera's general requests
 * are the kernel's own; only the driver-private ones are defined here.
 */
#pragma once

#include <linux/fb.h>
#include <linux/kd.h>
#include <linux/videodev2.h>

#define DEVICE_FRAMEBUFFER_PATH "/dev/graphics/fb0"
#define DEVICE_CONSOLE_PATH     "/dev/tty0"
#define DEVICE_CAMERA_PATH      "/dev/video0"

/* Framebuffer: the argument is the value itself, as with KDSETMODE. */
#define SARVOFB_IOCTL_SET_LAYER_INPUT_FORMAT 0x40014301 /* input format code */
#define SARVOFB_IOCTL_EN_LAYER               0x40014309 /* 0 disables the display layer, 1 enables it */

/* Camera: the argument points to an int32_t, as with VIDIOC_S_INPUT. */
#define SARVOCAM_IOCTL_PREVIEW 0xc0045662 /* 1 main camera, 0 second camera */
#define SARVOCAM_IOCTL_SELF_TEST                                                                             \
    0xc0045663 // test mode 0 or 1; a non-negative return value is the test's result
