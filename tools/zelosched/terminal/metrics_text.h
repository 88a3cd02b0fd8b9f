// Measured values as text that is OpenMetrics, and Prometheus' own format too.
#pragma once

#include <string>
#include <utility>
#include <vector>

class MetricsText {
 public:
  using Labels = std::vector<std::pair<std::string, std::string>>;

  // A gauge, to which the values behind it belong.
  void begin(const std::string &name, const std::string &help);
  // Label values may be any text; what is no UTF-8 in one is replaced.
  void add(const Labels &labels, double value);
  std::string whole() const { return text_ + "# EOF\n"; }

 private:
  std::string name_;
  std::string text_;
};
