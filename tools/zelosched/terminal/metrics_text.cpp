#include "terminal/metrics_text.h"

#include <sched_utf8.h>

#include <algorithm>
#include <charconv>

namespace {

constexpr char kReplacement[] = "\xEF\xBF\xBD";  // U+FFFD

std::string escaped(std::string_view text) {
  std::string out;
  while (!text.empty()) {
    const size_t bytes = schedFirstCharacter(text).bytes;
    const std::string_view character = text.substr(0, std::max<size_t>(bytes, 1));
    if (bytes == 0) {
      out += kReplacement;
    } else if (character == "\n") {
      out += "\\n";
    } else {
      if (character == "\\" || character == "\"") out += '\\';
      out += character;
    }
    text.remove_prefix(character.size());
  }
  return out;
}

// In the C locale, whatever the user's is.
std::string numberText(double value) {
  char text[64];
  const auto end = std::to_chars(std::begin(text), std::end(text), value);
  return std::string(text, end.ptr);
}

}  // namespace

void MetricsText::begin(const std::string &name, const std::string &help) {
  name_ = name;
  text_ += "# HELP " + name + " " + help + "\n# TYPE " + name + " gauge\n";
}

void MetricsText::add(const Labels &labels, double value) {
  text_ += name_;
  for (size_t i = 0; i < labels.size(); ++i) {
    text_ += (i == 0 ? "{" : ",") + labels[i].first + "=\"" + escaped(labels[i].second) + "\"";
  }
  text_ += (labels.empty() ? " " : "} ") + numberText(value) + "\n";
}
