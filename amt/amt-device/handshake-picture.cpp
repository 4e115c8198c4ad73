#include "amt/amt-device/handshake-picture.h"

#include <stdlib.h>

#include "amt/amt-device/embed/embedded-data.h"
#include "amt/amt-device/framebuffer.h"
#include "amt/amt-device/picture.h"
#include "amt/amt-log.h"
#include "pub/util/thread-end.h"

namespace {

constexpr uint32_t SHOW_DELAY_MS = 3000;

/* The picture's own records carry this tag. */
constexpr pub_log_source_st g_picture_log{"CHARGE_ONLY_MODE", ""};

/* The unpacked picture, kept as long as the process lives; null when it is not ready. */
uint8_t *g_pixel_ptr = nullptr;

int unpack_picture()
{
    uint8_t *pixel_ptr = static_cast<uint8_t *>(malloc(AMT_PICTURE_SIZE));
    if (pixel_ptr == nullptr) {
        PUB_LOG(g_picture_log, "Out of memory\n");
        return -1;
    }
    if (amt_picture_unpack(g_handshake_picture_a, g_handshake_picture_length, pixel_ptr) != 0) {
        PUB_LOG(g_picture_log, "Unexpected inflate error\n");
        free(pixel_ptr);
        return -1;
    }
    free(g_pixel_ptr);
    g_pixel_ptr = pixel_ptr;
    return 0;
}

int prepare()
{
    amt_framebuffer_silence_console();
    if (amt_framebuffer_open() != 0) {
        return -1;
    }
    if (unpack_picture() != 0) {
        amt_framebuffer_close();
        return -1;
    }
    return 0;
}

} // namespace

void *amt_handle_load_image_for_handshake(void *)
{
    const bool is_prepared = prepare() == 0;
    pub_util_sleep_ms(SHOW_DELAY_MS);
    if (is_prepared) {
        amt_framebuffer_show(g_pixel_ptr);
    }
    return nullptr;
}
