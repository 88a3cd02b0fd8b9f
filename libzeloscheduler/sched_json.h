// JsonCpp's older classes, whose way of writing is what this library's callers have always read.
// They are marked as deprecated; that is silenced here and nowhere else.
#ifndef SCHED_JSON_H
#define SCHED_JSON_H

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
#include <json/json.h>

#include <string>

inline std::string schedWriteJson(const Json::Value &value) {
  return Json::FastWriter().write(value);
}

// Comments are passed over. The reader can also keep them, but takes time that grows with the
// square of their number to do so, and the texts come from outside.
inline bool schedReadJson(const std::string &text, Json::Value *value) {
  constexpr bool kKeepComments = false;
  return Json::Reader().parse(text, *value, kKeepComments);
}
#pragma GCC diagnostic pop

#endif
