#pragma once

/*
 * Commands for the platform's shell, run by system(): the calling thread waits for their end, however long
 * they take.
 */

/*
 * Runs a command, at once again when it fails, five times at most. Logs every failed attempt, or that it
 * succeeded. Returns 0, or PUB_ERR_FAIL after the fifth failure.
 */
int amt_device_do_command(const char *command);

/* Runs a command once, where what comes of it changes nothing: debug traces, file modes. Logs nothing. */
void amt_device_run(const char *command);
