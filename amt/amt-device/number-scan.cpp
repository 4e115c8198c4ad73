#include "amt/amt-device/number-scan.h"

#include <ctype.h>
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
    int letter = getc(stream);
    while (letter != EOF && isspace(letter) != 0) {
        letter = getc(stream);
    }
    if (letter == EOF) {
        return EOF;
    }
    if (letter == '-' || letter == '+') {
        token_ptr->m_text_a[token_ptr->m_length++] = static_cast<char>(letter);
        letter = getc(stream);
    }
    const uint32_t sign_length = token_ptr->m_length;
    while (letter != EOF && isdigit(letter) != 0) {
        add_digit(token_ptr, sign_length, static_cast<char>(letter));
        letter = getc(stream);
    }
    return token_ptr->m_length > sign_length ? 1 : 0;
}

} // namespace

int amt_number_scan_int(FILE *stream, int32_t *value_ptr)
{
    token_st token;
    const int result = read_token(stream, &token);
    if (result == 1) {
        *value_ptr = static_cast<int32_t>(static_cast<uint32_t>(strtol(token.m_text_a, nullptr, 10)));
    }
    return result;
}

int amt_number_scan_unsigned(FILE *stream, uint32_t *value_ptr)
{
    token_st token;
    const int result = read_token(stream, &token);
    if (result == 1) {
        *value_ptr = static_cast<uint32_t>(strtoul(token.m_text_a, nullptr, 10));
    }
    return result;
}
