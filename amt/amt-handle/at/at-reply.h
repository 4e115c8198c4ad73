#pragma once

/*
 * Replies to AT text on the PC port. Each is sent at once and returns the sender's status
 * (amt_handle_send_rsp).
 */
int amt_at_reply_ok();
int amt_at_reply_error();
int amt_at_reply_cme();

/* A reply of the given text, at most 4095 characters. */
int amt_at_reply(const char *format, ...) __attribute__((format(printf, 1, 2)));
