#include "pub/cfg/cfg.h"

#include <string.h>

#include "pub/error.h"
#include "pub/pub-log.h"

namespace {

char *skip_blanks(char *text)
{
    while (*text == ' ') {
        text++;
    }
    return text;
}

/* Removes the blanks before end, down to start at most. */
void cut_blanks(const char *start, char *end)
{
    while (end > start && end[-1] == ' ') {
        *--end = '\0';
    }
}

} // namespace

int pub_cfg_get_line(FILE *stream, char *buf, uint32_t capacity, uint32_t *length_ptr, int *is_eof_ptr)
{
    if (stream == nullptr || buf == nullptr || length_ptr == nullptr || is_eof_ptr == nullptr) {
        return pub_log_bad_param(
            g_pub_cfg_log, {stream == nullptr, buf == nullptr, length_ptr == nullptr, is_eof_ptr == nullptr});
    }
    *is_eof_ptr = 0;
    memset(buf, 0, capacity);

    uint32_t used = 0;
    for (int character = getc(stream); character != '\n'; character = getc(stream)) {
        if (character == EOF) {
            *is_eof_ptr = 1;
            break;
        }
        if (used < capacity) {
            buf[used++] = static_cast<char>(character);
        }
    }

    uint32_t length = static_cast<uint32_t>(strnlen(buf, capacity));
    while (length != 0 && buf[length - 1] == '\r') {
        buf[--length] = '\0';
    }
    *length_ptr = length;
    return PUB_ERR_NONE;
}

int pub_cfg_get_param_and_value(char *line, char **key_ptr, char **value_ptr)
{
    if (line == nullptr || key_ptr == nullptr || value_ptr == nullptr) {
        return pub_log_bad_param(g_pub_cfg_log, {line == nullptr, key_ptr == nullptr, value_ptr == nullptr});
    }
    char *key = skip_blanks(line);
    if (*key == '#') {
        return PUB_ERR_NOT_FOUND;
    }
    char *equals = strchr(key, '=');
    if (equals == nullptr) {
        return PUB_ERR_NOT_FOUND;
    }
    *equals = '\0';
    cut_blanks(key, equals);
    char *value = skip_blanks(equals + 1);
    cut_blanks(value, value + strlen(value));
    *key_ptr = key;
    *value_ptr = value;
    return PUB_ERR_NONE;
}
