#include "pub/file/scan.h"

#include <errno.h>
#include <stdlib.h>

namespace {

/*
 * A sign, as many digits as any 64-bit number has and one more, so that every longer number still converts as
 * out of range, and the terminating zero.
 */
constexpr uint32_t DIGIT_COUNT_MAX = 21;
constexpr uint32_t TOKEN_SIZE = 1 + DIGIT_COUNT_MAX + 1;

struct token_st
{
    char m_text_a[TOKEN_SIZE];
    uint32_t m_length;
};

bool is_blank(int character)
{
    return character == ' ' || (character >= '\t' && character <= '\r');
}

bool is_digit(int character)
{
    return character >= '0' && character <= '9';
}

/* The first character that is no blank, or EOF. */
int skip_blanks(FILE *stream)
{
    errno = 0;
    int character = getc(stream);
    while (is_blank(character)) {
        character = getc(stream);
    }
    return character;
}

void unread(int character, FILE *stream)
{
    if (character != EOF) {
        ungetc(character, stream);
    }
}

void add_digit(token_st *token_ptr, uint32_t sign_length, char digit)
{
    const bool is_leading_zero =
        token_ptr->m_length == sign_length + 1 && token_ptr->m_text_a[sign_length] == '0';
    if (is_leading_zero) {
        token_ptr->m_length--;
    }
    if (token_ptr->m_length < sign_length + DIGIT_COUNT_MAX) {
        token_ptr->m_text_a[token_ptr->m_length++] = digit;
    }
}

/* Collects the text of one number. 1, 0 or EOF, as fscanf would return. */
int read_token(FILE *stream, token_st *token_ptr)
{
    *token_ptr = {};
    int character = skip_blanks(stream);
    if (character == EOF) {
        return EOF;
    }
    if (character == '-' || character == '+') {
        token_ptr->m_text_a[token_ptr->m_length++] = static_cast<char>(character);
        character = getc(stream);
    }
    const uint32_t sign_length = token_ptr->m_length;
    while (is_digit(character)) {
        add_digit(token_ptr, sign_length, static_cast<char>(character));
        character = getc(stream);
    }
    unread(character, stream);
    return token_ptr->m_length > sign_length ? 1 : 0;
}

} // namespace

int pub_file_scan_word(const pub_file_st &file, char *word_ptr, uint32_t size)
{
    int character = skip_blanks(file.m_stream_ptr);
    if (character == EOF) {
        return EOF;
    }
    uint32_t length = 0;
    while (length < size - 1 && character != EOF && character != '\0' && !is_blank(character)) {
        word_ptr[length++] = static_cast<char>(character);
        character = getc(file.m_stream_ptr);
    }
    unread(character, file.m_stream_ptr);
    word_ptr[length] = '\0';
    return 1;
}

int pub_file_scan_long(const pub_file_st &file, long *value_ptr)
{
    token_st token;
    const int result = read_token(file.m_stream_ptr, &token);
    if (result == 1) {
        *value_ptr = strtol(token.m_text_a, nullptr, 10);
    }
    return result;
}

int pub_file_scan_int(const pub_file_st &file, int32_t *value_ptr)
{
    long value = 0;
    const int result = pub_file_scan_long(file, &value);
    if (result == 1) {
        *value_ptr = static_cast<int32_t>(static_cast<uint32_t>(value));
    }
    return result;
}

int pub_file_scan_unsigned(const pub_file_st &file, uint32_t *value_ptr)
{
    token_st token;
    const int result = read_token(file.m_stream_ptr, &token);
    if (result == 1) {
        *value_ptr = static_cast<uint32_t>(strtoul(token.m_text_a, nullptr, 10));
    }
    return result;
}
