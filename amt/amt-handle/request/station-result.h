#pragma once

#include <stdint.h>

/* Room for a test description, in a modem's answer and in a request. */
constexpr uint32_t AMT_ANSWER_DESCRIPTION_SIZE = 128;
constexpr uint32_t AMT_REQUEST_DESCRIPTION_SIZE = 127;

/* A test station's verdict as the modem keeps it. */
struct amt_station_result_st
{
    int32_t m_station_num;
    int32_t m_verdict; /* 1 pass, 2 fail */
    char m_description_a[AMT_ANSWER_DESCRIPTION_SIZE];
};

/*
 * Reads a modem's answer line, "station,verdict,description" of length characters, into *result_ptr. Parts
 * that the line does not have stay as they are. Of the station number one or two digits are read, of the
 * verdict one.
 */
void amt_station_result_parse(const char *line, uint32_t length, amt_station_result_st *result_ptr);
