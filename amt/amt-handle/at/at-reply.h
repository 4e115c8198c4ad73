#pragma once

/*
 * Replies to AT text on the PC port. Each is sent at once and returns the sender's status
 * (amt_handle_send_rsp).
 */
int amt_at_reply_ok();    /* "OK" */
int amt_at_reply_error(); /* "ERROR": the command failed, or its operand means nothing */
int amt_at_reply_cme();   /* "+CME ERROR: 100": a file or a property could not be read or written */

/*
 * A reply of the given text, cut at 4095 characters: with its line ends, as the station sees it.
 */
int amt_at_reply(const char *format, ...) __attribute__((format(printf, 1, 2)));
