// JsonCpp's older classes, whose format is part of the interface. They are deprecated; in the
// library the warnings are silenced only here.
#ifndef SCHED_JSON_H
#define SCHED_JSON_H

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
#include <json/json.h>

#include <string>
#include <string_view>

// One of each is used for all texts of a call: constructing one costs more than a short text.
class SchedJsonWriter {
 public:
  std::string write(const Json::Value &value) { return writer_.write(value); }

 private:
  Json::FastWriter writer_;
};

class SchedJsonReader {
 public:
  // Comments are ignored. Keeping them would take the reader time quadratic in their number, and
  // the texts come from outside.
  bool read(std::string_view text, Json::Value *value) {
    constexpr bool kKeepComments = false;
    return reader_.parse(text.data(), text.data() + text.size(), *value, kKeepComments);
  }

 private:
  Json::Reader reader_;
};
#pragma GCC diagnostic pop

#endif
