#pragma once

/*
 * The status codes every operation of the daemon and its library answers with. 0 is success, everything else
 * is negative; stations and log readers know the numbers, so they never change.
 */
constexpr int PUB_ERR_NONE = 0;
constexpr int PUB_ERR_SYS_CALL = -1; /* a system call failed */
constexpr int PUB_ERR_FAIL = -100;   /* operation failed, malformed frame, unregistered id, bad descriptor */
constexpr int PUB_ERR_PARAM = -101;  /* an argument is absent or invalid */
constexpr int PUB_ERR_NOT_FOUND = -104;  /* not found; from a PC handler: not handled, hand the request on */
constexpr int PUB_ERR_NO_MODEM = -111;   /* the modem could not be opened at start-up */
constexpr int PUB_ERR_TIMEOUT = -113;    /* not writable in time */
constexpr int PUB_ERR_FILE = -118;       /* a file, device or system call failed */
constexpr int PUB_ERR_INCOMPLETE = -119; /* fewer bytes written than asked */
