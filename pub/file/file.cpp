#include "pub/file/file.h"

#include <errno.h>

#include "pub/file/scan.h"

namespace {

/* Each closes itself when the process starts a program ("e"). */
const char *get_mode_text(pub_file_mode_en mode)
{
    switch (mode) {
    case pub_file_mode_en::WRITE:
        return "we";
    case pub_file_mode_en::UPDATE:
        return "r+e";
    case pub_file_mode_en::RENEW:
        return "w+e";
    case pub_file_mode_en::READ:
        break;
    }
    return "re";
}

} // namespace

pub_file_st::pub_file_st(const char *path, pub_file_mode_en mode) : m_stream_ptr(nullptr)
{
    pub_file_open(this, path, mode);
}

pub_file_st::~pub_file_st()
{
    pub_file_close(this);
}

void pub_file_open(pub_file_st *file_ptr, const char *path, pub_file_mode_en mode)
{
    file_ptr->m_stream_ptr = fopen(path, get_mode_text(mode));
}

void pub_file_close(pub_file_st *file_ptr)
{
    if (!file_ptr->is_open()) {
        return;
    }
    const int saved_errno = errno;
    fclose(file_ptr->m_stream_ptr);
    file_ptr->m_stream_ptr = nullptr;
    errno = saved_errno;
}

uint32_t pub_file_get_line(const pub_file_st &file, char *line_ptr, uint32_t size)
{
    errno = 0;
    uint32_t length = 0;
    while (length < size - 1) {
        const int character = getc(file.m_stream_ptr);
        if (character == EOF) {
            break;
        }
        line_ptr[length++] = static_cast<char>(character);
        if (character == '\n') {
            break;
        }
    }
    line_ptr[length] = '\0';
    return length;
}

bool pub_file_put(const pub_file_st &file, const char *text, const char *line_end)
{
    FILE *const stream = file.m_stream_ptr;
    return fputs(text, stream) != EOF && fputs(line_end, stream) != EOF && fflush(stream) == 0;
}

pub_file_step_en pub_file_read_line(const char *path, char *line_ptr, uint32_t size)
{
    *line_ptr = '\0';
    const pub_file_st file(path, pub_file_mode_en::READ);
    if (!file.is_open()) {
        return pub_file_step_en::OPEN_FAILED;
    }
    return pub_file_get_line(file, line_ptr, size) > 0 ? pub_file_step_en::DONE
                                                       : pub_file_step_en::READ_FAILED;
}

pub_file_step_en pub_file_read_word(const char *path, char *word_ptr, uint32_t size)
{
    *word_ptr = '\0';
    const pub_file_st file(path, pub_file_mode_en::READ);
    if (!file.is_open()) {
        return pub_file_step_en::OPEN_FAILED;
    }
    return pub_file_scan_word(file, word_ptr, size) == 1 ? pub_file_step_en::DONE
                                                         : pub_file_step_en::READ_FAILED;
}

pub_file_step_en pub_file_write(const char *path, const char *text, const char *line_end)
{
    const pub_file_st file(path, pub_file_mode_en::RENEW);
    if (!file.is_open()) {
        return pub_file_step_en::OPEN_FAILED;
    }
    return pub_file_put(file, text, line_end) ? pub_file_step_en::DONE : pub_file_step_en::WRITE_FAILED;
}
