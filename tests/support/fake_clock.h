// The clock that time() shows to the library, the platform and the test. Children that are forked
// later see the same one. gettimeofday and clock_gettime stay real.
//
//   setZone("Europe/Berlin");        TZ, at once
//   setClock("2013-05-07 08:30");    local time in that zone, seconds may follow; it stands still
//   setClock(moment);                the same by a time_t
//   realClock();                     it goes again
//   localTime("2013-05-07 08:30")    what setClock would set
//   clockReads()                     calls of time() in this process so far
#pragma once

#include <ctime>
#include <string>

namespace support {

void setClock(const std::string &localTime);
void setClock(time_t now);
void realClock();
void setZone(const std::string &zone);
time_t localTime(const std::string &text);
unsigned clockReads();

}  // namespace support
