// JsonCpp's older classes, whose way of writing is what this library's callers have always read.
// They are marked as deprecated; that is silenced here and nowhere else.
#ifndef SCHED_JSON_H
#define SCHED_JSON_H

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
#include <json/json.h>

#include <string>
#include <string_view>

// One of each serves for all texts of a call: what they allocate to begin with is most of what a
// short text costs them.
class SchedJsonWriter {
 public:
  std::string write(const Json::Value &value) { return writer_.write(value); }

 private:
  Json::FastWriter writer_;
};

class SchedJsonReader {
 public:
  // Comments are passed over. The reader can also keep them, but takes time that grows with the
  // square of their number to do so, and the texts come from outside.
  bool read(std::string_view text, Json::Value *value) {
    constexpr bool kKeepComments = false;
    return reader_.parse(text.data(), text.data() + text.size(), *value, kKeepComments);
  }

 private:
  Json::Reader reader_;
};
#pragma GCC diagnostic pop

#endif
