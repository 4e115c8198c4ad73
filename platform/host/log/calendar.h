#pragma once

#include <stdint.h>

/*
 * Month (1 to 12) and day of the month of a day counted from 1970-01-01, UTC. The C library's conversion
 * takes a lock that a signal handler must not meet.
 */
inline void log_month_and_day(int64_t days, uint32_t *month, uint32_t *day)
{
    /* Years counted from March put the leap day at the end; 719468 days lie between 0000-03-01 and
     * 1970-01-01. */
    const uint32_t day_of_era = static_cast<uint32_t>((days + 719468) % 146097);
    const uint32_t year_of_era =
        (day_of_era - day_of_era / 1460 + day_of_era / 36524 - day_of_era / 146096) / 365;
    const uint32_t day_of_year = day_of_era - (365 * year_of_era + year_of_era / 4 - year_of_era / 100);
    const uint32_t month_from_march = (5 * day_of_year + 2) / 153;
    *day = day_of_year - (153 * month_from_march + 2) / 5 + 1;
    *month = month_from_march < 10 ? month_from_march + 3 : month_from_march - 9;
}
