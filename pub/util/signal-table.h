#pragma once

#include <initializer_list>
#include <signal.h>
#include <stdint.h>

/*
 * One signal, as the handset's kernel numbers it. The action is its default: T terminate, A abort with core,
 * I ignore, C continue, S stop, ? not classified.
 */
struct pub_util_signal_st // NOLINT(clang-analyzer-optin.performance.Padding): read as a table
{
    int32_t m_number;
    const char *m_name_ptr; /* null in the row that ends the table */
    char m_action;
    const char *m_description_ptr;
};

/* All signals in ascending order; a number with two names has two rows, the usual name first. */
extern const pub_util_signal_st pub_util_signal_table[];

/* The usual name of the signal, "" for a number not in the table. Logs nothing; fit for signal handlers. */
const char *pub_util_get_signal_name(int signal_number);

/* The set of the signals. Fit for signal handlers. */
sigset_t pub_util_get_signal_set(std::initializer_list<int> signal_list);
