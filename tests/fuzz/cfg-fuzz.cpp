#include <sys/mman.h>
#include <unistd.h>

#include "amt/amt-cfg.h"
#include "pub/cfg/cfg.h"
#include "pub/error.h"
#include "tests/fuzz/support/input.h"

/* The input is a configuration file. */
namespace {

void require_text(const char *text, size_t size)
{
    const size_t length = strnlen(text, size);
    FUZZ_REQUIRE(length < size);
    FUZZ_REQUIRE(text[0] != ' ' && memchr(text, '\n', length) == nullptr);
    for (size_t i = length; i < size; i++) {
        FUZZ_REQUIRE(text[i] == '\0');
    }
}

/* The line reader by itself, over lines of any capacity. */
void read_lines(FILE *stream, uint32_t capacity)
{
    std::vector<char> line(capacity + 1);
    line.shrink_to_fit();
    int is_eof = 0;
    while (is_eof == 0) {
        uint32_t length = 0;
        FUZZ_REQUIRE(pub_cfg_get_line(stream, line.data(), capacity, &length, &is_eof) == PUB_ERR_NONE);
        FUZZ_REQUIRE(length <= capacity && strlen(line.data()) == length);
        char *key = nullptr;
        char *value = nullptr;
        if (pub_cfg_get_param_and_value(line.data(), &key, &value) == PUB_ERR_NONE) {
            FUZZ_REQUIRE(key >= line.data() && key + strlen(key) < value);
            FUZZ_REQUIRE(value + strlen(value) <= line.data() + capacity);
        }
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    const int fd = memfd_create("cfg", 0);
    FUZZ_REQUIRE(fd >= 0 && write(fd, data, size) == static_cast<ssize_t>(size));
    char path_a[32];
    snprintf(path_a, sizeof(path_a), "/proc/self/fd/%d", fd);

    FUZZ_REQUIRE(amt_cfg_init(path_a) == PUB_ERR_NONE);
    require_text(g_amt_cfg.m_tty_pc_a, sizeof(g_amt_cfg.m_tty_pc_a));
    require_text(g_amt_cfg.m_tty_app_a, sizeof(g_amt_cfg.m_tty_app_a));
    require_text(g_amt_cfg.m_tty_modem_a, sizeof(g_amt_cfg.m_tty_modem_a));
    require_text(g_amt_cfg.m_tty_at_mux_a, sizeof(g_amt_cfg.m_tty_at_mux_a));
    require_text(g_amt_cfg.m_audio_file_a, sizeof(g_amt_cfg.m_audio_file_a));
    require_text(g_amt_cfg.m_mode_file_a, sizeof(g_amt_cfg.m_mode_file_a));

    FILE *stream = fdopen(fd, "r");
    for (const uint32_t capacity : {1U, 8U, 100U}) {
        rewind(stream);
        read_lines(stream, capacity);
    }
    fclose(stream);
    return 0;
}
