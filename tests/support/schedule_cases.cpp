#include "schedule_cases.h"

#include <algorithm>
#include <cstring>
#include <sstream>

namespace support {
namespace {

using std::string_view_literals::operator""sv;

constexpr int32_t kOnce = ZELO_SCHED_TYPE_ONCE;
constexpr int32_t kDaily = ZELO_SCHED_TYPE_DAILY;
constexpr int32_t kWeekly = ZELO_SCHED_TYPE_WEEKLY;
constexpr int32_t kMonthly = ZELO_SCHED_TYPE_MONTHLY;
constexpr int32_t kYearly = ZELO_SCHED_TYPE_YEARLY;
constexpr uint32_t kHuge = UINT32_MAX;
constexpr bool kReadable = true;
constexpr bool kUnreadable = false;
constexpr bool kDue = true;
constexpr bool kNotDue = false;

// 7 May 2013 was a Tuesday.
constexpr Day k7May = {2013, 5, 7};

// A daily task.
ScheduleCase hoursCase(uint32_t first, uint32_t repeat, uint32_t last, const std::string &hours,
                       std::vector<Moment> moments) {
  const std::string what =
      std::to_string(first) + ", every " + std::to_string(repeat) + " to " + std::to_string(last);
  const Schedule schedule = {.hour = first, .repeat = repeat, .last = last};
  return {what, schedule, "30 " + hours + " * * *", first <= 23, std::move(moments)};
}

std::vector<ScheduleCase> makeCases() {
  std::vector<ScheduleCase> cases = {
      // ---- once
      {"once",
       {.type = kOnce, .start = k7May},
       "30 8 7 5 *",
       kReadable,
       {{"2012-05-07 08:30", kNotDue, "2013-05-07 08:30"},
        {"2013-05-06 08:30", kNotDue, "2013-05-07 08:30"},
        {"2013-05-07 07:00", kNotDue, "2013-05-07 08:30"},
        {"2013-05-07 08:30", kDue, kNever},
        {"2013-05-08 08:30", kNotDue, kNever},
        {"2014-05-07 08:30", kNotDue, kNever}}},
      {"once, repeated",
       {.type = kOnce, .start = k7May, .repeat = 2, .last = 17},
       "30 8,10,12,14,16 7 5 *",
       kReadable,
       {{"2013-05-06 23:00", kNotDue, "2013-05-07 08:30"},
        {"2013-05-07 12:30", kDue, "2013-05-07 14:30"},
        {"2013-05-07 17:00", kNotDue, kNever}}},
      {"once, on a start date that was never set",
       {.type = kOnce, .start = {0, 0, 0}},
       "30 8 0 0 *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, kNever}}},
      {"once, on day 0",
       {.type = kOnce, .start = {2013, 5, 0}},
       "30 8 0 5 *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, kNever}}},
      {"once, on day 32",
       {.type = kOnce, .start = {2013, 5, 32}},
       "30 8 32 5 *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, "2013-05-32 08:30", kNever}}},
      {"once, in month 0",
       {.type = kOnce, .start = {2013, 0, 7}},
       "30 8 7 0 *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, kNever}}},
      {"once, on 31 June",
       {.type = kOnce, .start = {2013, 6, 31}},
       "30 8 31 6 *",
       kReadable,
       {{"2013-05-07 08:30", kNotDue, "2013-06-31 08:30", kNever},
        {"2013-07-01 08:30", kNotDue, kNever}}},
      {"once, in month 13",
       {.type = kOnce, .start = {2013, 13, 1}},
       "30 8 1 13 *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, "2013-13-01 08:30", kNever}}},
      // ---- daily
      {"daily",
       {.type = kDaily, .start = k7May},
       "30 8 * * *",
       kReadable,
       {{"2012-12-31 08:30", kNotDue, "2013-01-01 08:30", "2013-05-07 08:30"},
        {"2013-04-30 08:30", kNotDue, "2013-05-01 08:30", "2013-05-07 08:30"},
        {"2013-05-06 07:00", kNotDue, "2013-05-06 08:30", "2013-05-07 08:30"},
        {"2013-05-07 08:29:59", kNotDue, "2013-05-07 08:30"},
        {"2013-05-07 08:30", kDue, "2013-05-08 08:30"},
        {"2013-05-07 08:30:59", kDue, "2013-05-08 08:30"},
        {"2013-05-07 08:31", kNotDue, "2013-05-08 08:30"},
        {"2013-12-31 23:59", kNotDue, "2014-01-01 08:30"},
        {"2014-01-01 08:30", kDue, "2014-01-02 08:30"},
        {"2014-02-28 12:00", kNotDue, "2014-03-01 08:30"},
        {"2016-02-28 12:00", kNotDue, "2016-02-29 08:30"}}},
      {"daily, with a week without days",
       {.type = kDaily, .week = "0000000"},
       "30 8 * * *",
       kReadable,
       {{"2013-05-07 08:30", kDue, "2013-05-08 08:30"}}},
      {"daily, from a day on that does not exist",
       {.type = kDaily, .start = {2030, 6, 31}},
       "30 8 * * *",
       kReadable,
       {{"2013-05-07 08:30", kNotDue, "2013-05-08 08:30", "2030-07-01 08:30"}}},
      {"daily, from a year on",
       {.type = kDaily, .start = {2098, 0, 0}},
       "30 8 * * *",
       kReadable,
       {{"2026-11-21 00:00", kNotDue, "2026-11-21 08:30", "2098-01-01 08:30"}}},
      {"daily, from a month on",
       {.type = kDaily, .start = {2098, 5, 0}},
       "30 8 * * *",
       kReadable,
       {{"2026-11-21 00:00", kNotDue, "2026-11-21 08:30", "2098-05-01 08:30"}}},
      {"daily, from a month on that does not exist",
       {.type = kDaily, .start = {2098, 99, 0}},
       "30 8 * * *",
       kReadable,
       {{"2026-11-21 00:00", kNotDue, "2026-11-21 08:30", "2099-01-01 08:30"}}},
      {"daily, from a year on that never comes",
       {.type = kDaily, .start = {kHuge, 1, 1}},
       "30 8 * * *",
       kReadable,
       {{"2026-11-21 00:00", kNotDue, "2026-11-21 08:30", kNever}}},
      {"daily, in the last minute of the day",
       {.type = kDaily, .hour = 23, .minute = 59},
       "59 23 * * *",
       kReadable,
       {{"2013-05-07 23:58", kNotDue, "2013-05-07 23:59"},
        {"2013-05-07 23:59", kDue, "2013-05-08 23:59"}}},
      {"daily, in minute 60",
       {.type = kDaily, .minute = 60},
       "60 8 * * *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, "2013-05-07 08:60", kNever},
        {"2013-05-07 09:00", kNotDue, "2013-05-08 08:60", kNever}}},
      // ---- weekly
      {"weekly, on Tuesdays",
       {.type = kWeekly, .week = "0010000", .start = k7May},
       "30 8 * * 2",
       kReadable,
       {{"2013-04-30 08:30", kNotDue, "2013-05-07 08:30"},
        {"2013-04-23 08:30", kNotDue, "2013-04-30 08:30", "2013-05-07 08:30"},
        {"2013-05-07 07:00", kNotDue, "2013-05-07 08:30"},
        {"2013-05-07 08:30", kDue, "2013-05-14 08:30"},
        {"2013-05-08 08:30", kNotDue, "2013-05-14 08:30"},
        {"2013-05-13 08:30", kNotDue, "2013-05-14 08:30"},
        {"2013-05-14 08:30", kDue, "2013-05-21 08:30"},
        {"2013-12-31 09:00", kNotDue, "2014-01-07 08:30"}}},
      {"weekly, on all days but Tuesday",
       {.type = kWeekly, .week = "1101111"},
       "30 8 * * 0,1,3,4,5,6",
       kReadable,
       {{"2013-05-14 08:30", kNotDue, "2013-05-15 08:30"},
        {"2013-05-15 08:30", kDue, "2013-05-16 08:30"}}},
      {"weekly, on Sundays",
       {.type = kWeekly, .week = "1000000"},
       "30 8 * * 0",
       kReadable,
       {{"2013-05-07 09:00", kNotDue, "2013-05-12 08:30"},
        {"2013-05-11 08:30", kNotDue, "2013-05-12 08:30"},
        {"2013-05-12 08:30", kDue, "2013-05-19 08:30"}}},
      {"weekly, on Mondays",
       {.type = kWeekly, .week = "0100000"},
       "30 8 * * 1",
       kReadable,
       {{"2013-05-07 09:00", kNotDue, "2013-05-13 08:30"}}},
      {"weekly, on Wednesdays",
       {.type = kWeekly, .week = "0001000"},
       "30 8 * * 3",
       kReadable,
       {{"2013-05-07 07:00", kNotDue, "2013-05-08 08:30"}}},
      {"weekly, on Thursdays",
       {.type = kWeekly, .week = "0000100"},
       "30 8 * * 4",
       kReadable,
       {{"2013-05-07 09:00", kNotDue, "2013-05-09 08:30"}}},
      {"weekly, on Fridays",
       {.type = kWeekly, .week = "0000010"},
       "30 8 * * 5",
       kReadable,
       {{"2013-05-07 09:00", kNotDue, "2013-05-10 08:30"},
        {"2013-05-17 08:30", kDue, "2013-05-24 08:30"}}},
      {"weekly, on Saturdays",
       {.type = kWeekly, .week = "0000001"},
       "30 8 * * 6",
       kReadable,
       {{"2013-05-07 09:00", kNotDue, "2013-05-11 08:30"},
        {"2013-05-11 08:30", kDue, "2013-05-18 08:30"}}},
      {"weekly, on two days",
       {.type = kWeekly, .week = "0100010"},
       "30 8 * * 1,5",
       kReadable,
       {{"2026-11-21 00:00", kNotDue, "2026-11-23 08:30"},
        {"2026-11-23 08:30", kDue, "2026-11-27 08:30"},
        {"2026-11-27 08:30", kDue, "2026-11-30 08:30"}}},
      {"weekly, on every day",
       {.type = kWeekly, .week = "1111111"},
       "30 8 * * 0,1,2,3,4,5,6",
       kReadable,
       {{"2013-05-07 09:00", kNotDue, "2013-05-08 08:30"}}},
      {"weekly, any character but zero",
       {.type = kWeekly, .week = "x0y 0z0"},
       "30 8 * * 0,2,3,5",
       kReadable,
       {{"2013-05-06 08:30", kNotDue, "2013-05-07 08:30"},
        {"2013-05-07 08:30", kDue, "2013-05-08 08:30"},
        {"2013-05-08 08:30", kDue, "2013-05-10 08:30"}}},
      {"weekly, two characters",
       {.type = kWeekly, .week = "01"},
       "30 8 * * 1,2,3,4,5,6",
       kReadable,
       {{"2013-05-12 08:30", kNotDue, "2013-05-13 08:30"},
        {"2013-05-18 08:30", kDue, "2013-05-20 08:30"}}},
      {"weekly, no character",
       {.type = kWeekly, .week = ""},
       "30 8 * * 0,1,2,3,4,5,6",
       kReadable,
       {{"2013-05-07 08:30", kDue, "2013-05-08 08:30"}}},
      {"weekly, zeros behind the end",
       {.type = kWeekly, .week = "0000\00000"sv},
       "30 8 * * 4,5,6",
       kReadable,
       {{"2013-05-07 08:30", kNotDue, "2013-05-09 08:30"},
        {"2013-05-11 08:30", kDue, "2013-05-16 08:30"}}},
      {"weekly, without a day",
       {.type = kWeekly, .week = "0000000", .start = k7May},
       "30 8 * * ",
       kUnreadable,
       {{"2013-05-06 08:30", kNotDue, "2013-05-14 08:30", kNever},
        {"2013-05-07 08:30", kDue, "2013-05-15 08:30", kNever},
        {"2013-05-08 08:30", kNotDue, "2013-05-16 08:30", kNever},
        {"2013-05-14 08:30", kNotDue, "2013-05-22 08:30", kNever}}},
      {"weekly, on its start date as well",
       {.type = kWeekly, .week = "0001000", .start = k7May},
       "30 8 * * 3",
       kReadable,
       {{"2013-05-07 08:30", kDue, "2013-05-08 08:30"},
        {"2013-05-14 08:30", kNotDue, "2013-05-15 08:30"}}},
      {"weekly, repeated",
       {.type = kWeekly, .week = "0010000", .repeat = 2, .last = 17},
       "30 8,10,12,14,16 * * 2",
       kReadable,
       {{"2013-05-07 12:30", kDue, "2013-05-07 14:30"},
        {"2013-05-07 16:30", kDue, "2013-05-14 08:30"}}},
      // ---- monthly
      {"monthly",
       {.type = kMonthly, .start = k7May},
       "30 8 7 * *",
       kReadable,
       {{"2013-01-10 12:00", kNotDue, "2013-05-07 08:30"},
        {"2013-04-07 08:30", kNotDue, "2013-05-07 08:30"},
        {"2013-05-07 07:00", kNotDue, "2013-05-07 08:30"},
        {"2013-05-07 08:30", kDue, "2013-06-07 08:30"},
        {"2013-06-07 07:00", kNotDue, "2013-06-07 08:30"},
        {"2013-06-07 08:30", kDue, "2013-07-07 08:30"},
        {"2013-06-08 08:30", kNotDue, "2013-07-07 08:30"},
        {"2013-12-20 12:00", kNotDue, "2014-01-07 08:30"},
        {"2014-01-02 12:00", kNotDue, "2014-01-07 08:30"}}},
      {"monthly on day 31",
       {.type = kMonthly, .start = {2012, 1, 31}},
       "30 8 31 * *",
       kReadable,
       {{"2012-02-29 12:00", kNotDue, "2012-03-02 08:30", "2012-03-31 08:30"},
        {"2013-01-31 12:00", kNotDue, "2013-03-03 08:30", "2013-03-31 08:30"},
        {"2013-04-30 12:00", kNotDue, "2013-05-01 08:30", "2013-05-31 08:30"},
        {"2013-05-31 08:30", kDue, "2013-07-01 08:30", "2013-07-31 08:30"},
        {"2013-06-30 08:30", kNotDue, "2013-07-01 08:30", "2013-07-31 08:30"},
        {"2013-07-01 08:30", kNotDue, "2013-07-31 08:30"}}},
      {"monthly, from 31 June on",
       {.type = kMonthly, .start = {2013, 6, 31}},
       "30 8 31 * *",
       kReadable,
       {{"2013-05-31 08:30", kNotDue, "2013-06-31 08:30", "2013-07-31 08:30"}}},
      {"monthly on day 0",
       {.type = kMonthly, .start = {2012, 1, 0}},
       "30 8 0 * *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, "2013-05-31 08:30", kNever}}},
      {"monthly on day 32",
       {.type = kMonthly, .start = {2012, 1, 32}},
       "30 8 32 * *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, "2013-06-01 08:30", kNever}}},
      {"monthly, repeated",
       {.type = kMonthly, .start = {2013, 1, 7}, .repeat = 2, .last = 17},
       "30 8,10,12,14,16 7 * *",
       kReadable,
       {{"2013-05-07 12:30", kDue, "2013-05-07 14:30"},
        {"2013-05-07 16:30", kDue, "2013-06-07 08:30"}}},
      // ---- yearly
      {"yearly",
       {.type = kYearly, .start = k7May},
       "30 8 7 5 *",
       kReadable,
       {{"2012-05-07 08:30", kNotDue, "2013-05-07 08:30"},
        {"2013-05-06 12:00", kNotDue, "2013-05-07 08:30"},
        {"2013-05-07 08:30", kDue, "2014-05-07 08:30"},
        {"2013-06-01 07:00", kNotDue, "2014-05-07 08:30"},
        {"2014-04-30 12:00", kNotDue, "2014-05-07 08:30"},
        {"2014-05-06 12:00", kNotDue, "2014-05-07 08:30"},
        {"2014-05-07 07:00", kNotDue, "2014-05-07 08:30"},
        {"2014-05-07 08:30", kDue, "2015-05-07 08:30"},
        {"2014-05-08 08:30", kNotDue, "2015-05-07 08:30"},
        {"2014-06-07 08:30", kNotDue, "2015-05-07 08:30"}}},
      {"yearly on 29 February",
       {.type = kYearly, .start = {2012, 2, 29}},
       "30 8 29 2 *",
       kReadable,
       {{"2013-02-28 08:30", kNotDue, "2013-03-01 08:30", "2016-02-29 08:30"},
        {"2013-03-01 08:30", kNotDue, "2014-03-01 08:30", "2016-02-29 08:30"},
        {"2015-03-10 12:00", kNotDue, "2016-02-29 08:30"},
        {"2016-02-29 08:30", kDue, "2017-03-01 08:30", "2020-02-29 08:30"},
        {"2096-03-01 00:00", kNotDue, "2097-03-01 08:30", "2104-02-29 08:30"}}},
      {"yearly on 30 February",
       {.type = kYearly, .start = {2012, 2, 30}},
       "30 8 30 2 *",
       kReadable,
       {{"2013-03-02 08:30", kNotDue, "2014-03-02 08:30", kNever}}},
      {"yearly on a start date that was never set",
       {.type = kYearly, .start = {0, 0, 0}},
       "30 8 0 0 *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, "2013-11-30 08:30", kNever}}},
      {"yearly on day 32",
       {.type = kYearly, .start = {2012, 5, 32}},
       "30 8 32 5 *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, "2013-06-01 08:30", kNever}}},
      {"yearly in month 0",
       {.type = kYearly, .start = {2012, 0, 7}},
       "30 8 7 0 *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, "2013-12-07 08:30", kNever}}},
      {"yearly in month 13",
       {.type = kYearly, .start = {2012, 13, 7}},
       "30 8 7 13 *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, "2014-01-07 08:30", kNever}}},
      {"yearly, repeated",
       {.type = kYearly, .start = k7May, .repeat = 2, .last = 17},
       "30 8,10,12,14,16 7 5 *",
       kReadable,
       {{"2013-05-07 12:30", kDue, "2013-05-07 14:30"},
        {"2013-05-07 16:30", kDue, "2014-05-07 08:30"}}},
      {"yearly, the greatest numbers",
       {.type = kYearly,
        .start = {kHuge, kHuge, kHuge},
        .hour = kHuge,
        .minute = kHuge,
        .repeat = 0,
        .last = kHuge},
       "4294967295 4294967295 4294967295 4294967295 *",
       kUnreadable,
       {{"2013-05-07 08:30", kNotDue, "4294967295-4294967295-4294967295 4294967295:4294967295",
         kNever}}},
      // ---- types that do not exist
      {"of type 5",
       {.type = 5, .week = "0010000", .start = k7May},
       "30 8 * * *",
       kReadable,
       {{"2013-05-06 08:30", kNotDue, "4294967295-11-30 08:30", "2013-05-07 08:30"},
        {"2013-05-07 07:00", kNotDue, "2013-05-07 08:30"},
        {"2013-05-07 08:30", kDue, "4294967295-11-30 08:30", kNever},
        {"2013-05-14 07:00", kNotDue, "2013-05-14 08:30", kNever},
        {"2013-05-14 08:30", kNotDue, "4294967295-11-30 08:30", kNever}}},
      {"of type -1",
       {.type = -1, .week = "0010000"},
       "30 8 * * *",
       kReadable,
       {{"2013-05-07 07:00", kNotDue, "2013-05-07 08:30", kNever}}},
      {"of the greatest type",
       {.type = INT32_MAX, .week = "0010000"},
       "30 8 * * *",
       kReadable,
       {{"2013-05-07 07:00", kNotDue, "2013-05-07 08:30", kNever}}},
      {"of the least type",
       {.type = INT32_MIN, .week = "0010000"},
       "30 8 * * *",
       kReadable,
       {{"2013-05-07 07:00", kNotDue, "2013-05-07 08:30", kNever}}},
  };
  // ---- hours
  const std::vector<ScheduleCase> hours = {
      hoursCase(8, 0, 0, "8", {{"2013-05-07 08:30", kDue, "2013-05-08 08:30"}}),
      hoursCase(8, 0, 23, "8", {{"2013-05-07 08:30", kDue, "2013-05-08 08:30"}}),
      hoursCase(23, 0, 0, "23", {{"2013-05-07 23:30", kDue, "2013-05-08 23:30"}}),
      hoursCase(8, 2, 17, "8,10,12,14,16",
                {{"2013-05-07 12:00", kNotDue, "2013-05-07 12:30"},
                 {"2013-05-07 12:30", kDue, "2013-05-07 14:30"},
                 {"2013-05-07 16:30", kDue, "2013-05-08 08:30"}}),
      hoursCase(8, 3, 17, "8,11,14,17", {{"2013-05-07 16:30", kNotDue, "2013-05-07 17:30"}}),
      hoursCase(8, 1, 7, "8", {{"2013-05-07 08:30", kDue, "2013-05-08 08:30"}}),
      hoursCase(20, 3, 5, "20", {{"2013-05-07 20:30", kDue, "2013-05-08 20:30"}}),
      hoursCase(20, 3, 20, "20", {{"2013-05-07 20:30", kDue, "2013-05-08 20:30"}}),
      hoursCase(0, 1, 23, "0,1,2,3,4,5,6,7,8,9,10,11,12,13,14,15,16,17,18,19,20,21,22,23",
                {{"2013-05-07 00:00", kNotDue, "2013-05-07 00:30"},
                 {"2013-05-07 00:30", kDue, "2013-05-07 01:30"},
                 {"2013-05-07 22:30", kDue, "2013-05-07 23:30"},
                 {"2013-05-07 23:30", kDue, "2013-05-08 00:30"}}),
      hoursCase(0, 23, 23, "0,23", {{"2013-05-07 00:30", kDue, "2013-05-07 23:30"}}),
      hoursCase(0, 24, 23, "0", {{"2013-05-07 00:30", kDue, "2013-05-08 00:30"}}),
      // Beyond the day, where cron would not read them.
      hoursCase(8, 2, 30, "8,10,12,14,16,18,20,22",
                {{"2013-05-07 20:30", kDue, "2013-05-07 22:30"},
                 {"2013-05-07 22:30", kDue, "2013-05-08 08:30"}}),
      hoursCase(8, 1, 99, "8,9,10,11,12,13,14,15,16,17,18,19,20,21,22,23",
                {{"2013-05-07 22:45", kNotDue, "2013-05-07 23:30"},
                 {"2013-05-07 23:45", kNotDue, "2013-05-08 08:30"}}),
      hoursCase(0, 11, 99, "0,11,22", {{"2013-05-07 22:30", kDue, "2013-05-08 00:30"}}),
      hoursCase(8, 5, kHuge, "8,13,18,23", {{"2013-05-07 23:30", kDue, "2013-05-08 08:30"}}),
      hoursCase(22, 1, kHuge, "22,23", {{"2013-05-07 22:30", kDue, "2013-05-07 23:30"}}),
      // Sums that leave 32 bits.
      hoursCase(8, kHuge, kHuge, "8", {{"2013-05-07 08:30", kDue, "2013-05-08 08:30"}}),
      hoursCase(8, kHuge - 7, kHuge, "8", {{"2013-05-07 09:00", kNotDue, "2013-05-08 08:30"}}),
      hoursCase(23, kHuge, kHuge, "23", {{"2013-05-07 23:30", kDue, "2013-05-08 23:30"}}),
      // First hours that no day has.
      hoursCase(24, 0, 0, "24", {{"2013-05-07 23:59", kNotDue, "2013-05-07 24:30", kNever}}),
      hoursCase(24, 1, 99, "24", {{"2013-05-07 00:30", kNotDue, "2013-05-07 24:30", kNever}}),
      hoursCase(30, 1, kHuge, "30", {{"2013-05-07 00:30", kNotDue, "2013-05-07 30:30", kNever}}),
      hoursCase(kHuge, kHuge, 0, "-1",
                {{"2013-05-07 00:30", kNotDue, "2013-05-07 4294967295:30", kNever}}),
  };
  cases.insert(cases.end(), hours.begin(), hours.end());
  return cases;
}

std::vector<std::string> split(const std::string &text, char separator) {
  std::vector<std::string> pieces;
  std::istringstream stream(text);
  for (std::string piece; std::getline(stream, piece, separator);) pieces.push_back(piece);
  return pieces;
}

}  // namespace

const std::vector<ScheduleCase> &scheduleCases() {
  static const std::vector<ScheduleCase> cases = makeCases();
  return cases;
}

Task taskOf(const Schedule &schedule) {
  Task task = makeTask("task", "true");
  task->ID = 1;
  task->Type = schedule.type;
  std::memset(task->Week, 0, sizeof(task->Week));
  std::memcpy(task->Week, schedule.week.data(), std::min(schedule.week.size(), size_t{7}));
  task->StartYear = schedule.start.year;
  task->StartMonth = schedule.start.month;
  task->StartDay = schedule.start.day;
  task->RunHour = schedule.hour;
  task->RunMin = schedule.minute;
  task->RepeatHour = schedule.repeat;
  task->LastWorkHour = schedule.last;
  return task;
}

std::string lineOf(const ScheduleCase &each) {
  std::string line = each.fields;
  std::replace(line.begin(), line.end(), ' ', '\t');
  return line + "\troot\t/tmp/zeloschedtask --run id=1";
}

std::string nextOf(const Moment &moment) {
  return moment.next != nullptr ? moment.next : moment.shown;
}

bool isStorable(const Schedule &schedule) {
  return schedule.type >= kOnce && schedule.type <= kYearly;
}

std::vector<uint32_t> hoursOf(const ScheduleCase &each) {
  std::vector<uint32_t> hours;
  for (const std::string &hour : split(split(each.fields, ' ').at(1), ',')) {
    const int64_t number = std::stoll(hour);
    if (number >= 0 && number <= 23) hours.push_back(static_cast<uint32_t>(number));
  }
  return hours;
}

}  // namespace support
