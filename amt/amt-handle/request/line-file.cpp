#include "amt/amt-handle/request/line-file.h"

#include <errno.h>
#include <string.h>

uint32_t amt_line_get(FILE *stream, char *line_ptr)
{
    uint32_t length = 0;
    while (length < AMT_LINE_LENGTH) {
        const int c = getc(stream);
        if (c == EOF) {
            break;
        }
        line_ptr[length++] = static_cast<char>(c);
        if (c == '\n') {
            break;
        }
    }
    line_ptr[length] = '\0';
    return length;
}

amt_line_step_en amt_line_file_read(const char *path, char *line_ptr)
{
    line_ptr[0] = '\0';
    FILE *const stream = fopen(path, "r");
    if (stream == nullptr) {
        return amt_line_step_en::OPEN_FAILED;
    }
    errno = 0;
    const uint32_t length = amt_line_get(stream, line_ptr);
    const int read_errno = errno;
    fclose(stream);
    errno = read_errno;
    return length > 0 ? amt_line_step_en::DONE : amt_line_step_en::READ_FAILED;
}

void amt_line_copy(char *dst, uint32_t size, const char *text)
{
    const size_t length = strnlen(text, size - 1);
    memcpy(dst, text, length);
    dst[length] = '\0';
}
