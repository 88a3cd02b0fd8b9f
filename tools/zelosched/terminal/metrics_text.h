// Metrics as text that is valid as OpenMetrics and in the format of Prometheus.
#pragma once

#include <string>
#include <utility>
#include <vector>

class MetricsText {
 public:
  using Labels = std::vector<std::pair<std::string, std::string>>;

  // A gauge, to which the values that are added next belong.
  void begin(const std::string &name, const std::string &help);
  // Label values may be any text; bytes that are not UTF-8 are replaced.
  void add(const Labels &labels, double value);
  std::string whole() const { return text_ + "# EOF\n"; }

 private:
  std::string name_;
  std::string text_;
};
