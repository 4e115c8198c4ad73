#pragma once

#include <stdint.h>
#include <string_view>

/*
 * One exchange with the modem: a command goes out, answers are collected until the final result. The two
 * areas belong to the reader thread whose handler runs; nothing here may be called from two threads at once.
 */

constexpr uint32_t AMT_AT_AREA_SIZE = 4096;

/* Text to or from the modem. The byte behind the area is always 0. */
struct amt_at_area_st
{
    uint32_t m_len; /* valid bytes; all bytes behind them are 0 */
    char m_text_a[AMT_AT_AREA_SIZE + 1];
};

extern amt_at_area_st g_at_transmit;
extern amt_at_area_st g_at_receive;

/* The final results: the well-formed one, and the laxer text that the tunnel is content with. */
constexpr const char *AMT_AT_OK = "\r\nOK\r\n";
constexpr const char *AMT_AT_OK_ANYWHERE = "OK";

/* What is logged after each read. */
enum class amt_at_trace_en : uint8_t
{
    NONE,
    TEXT,  /* "name :text" */
    STATUS /* "name  ret_val[status] m_buf_a[text]" */
};

/* What tells one exchange from another. All texts are static. */
struct amt_at_exchange_st
{
    const char *m_name_ptr; /* the function it belongs to, for the log */
    amt_at_trace_en m_trace;
    const char *m_ok_ptr;  /* the text that ends it well */
    bool m_is_error_first; /* an error result is looked for before m_step_ptr runs, not after m_ok_ptr */
    /*
     * Called with the context after each good read, before m_ok_ptr is looked for; may be null. A status
     * other than 0 ends the exchange, and is its result unless an error result stands in the same text.
     */
    int (*m_step_ptr)(void *context);
};

/* Zeroes both areas. */
void amt_at_clear();

/* Zeroes both areas and puts a command into the transmit area, cut at 4095 characters. */
void amt_at_set_command(const char *format, ...) __attribute__((format(printf, 1, 2)));

/*
 * Sends the transmit area and collects the answer in the receive area until a final result: "\r\n+CME ERROR",
 * "\r\n+CMS ERROR" and "\r\nERROR\r\n" are the bad ones. Waits without limit. Returns 0, PUB_ERR_FAIL for a bad final
 * result, PUB_ERR_PARAM when the receive area is full without one, the status of m_step_ptr, or the failing status of
 * the AT channel; the error line of a failure names m_name_ptr and the caller's line.
 */
int amt_at_exchange(const amt_at_exchange_st &exchange, void *context, int line = __builtin_LINE());

/* What the receive area holds. */
std::string_view amt_at_received();

/*
 * Removes length bytes at offset from the receive area and closes the gap. Requires that they lie inside what
 * the area holds.
 */
void amt_at_remove(uint32_t offset, uint32_t length);

/* Where text begins in the receive area; null when it is not there. What follows is terminated. */
const char *amt_at_find(const char *text);

/*
 * The value of an answer line: what stands between the prefix, blanks behind it stepped over, and the next
 * good final result, less line ends. dst (limit + 1 bytes) gets its first limit bytes, terminated;
 * *length_ptr their number. Returns 0, or PUB_ERR_FAIL for a missing prefix (dst is empty then) or a value longer
 * than limit.
 */
int amt_at_get_value(const char *prefix, uint32_t limit, char *dst, uint32_t *length_ptr);
