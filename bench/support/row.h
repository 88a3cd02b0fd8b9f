// One row of the table that a benchmark program prints: something that the product does, and what
// it is compared with. All of it is measured in one run, repetition by repetition in random order,
// so that what else the machine does falls on both sides; the ratios are of medians.
#ifndef BENCH_ROW_H
#define BENCH_ROW_H

#include <cstddef>
#include <functional>
#include <string>

struct Work {
  std::function<void()> work;
  // Before the first time of each repetition, and before each time. Neither is measured. What has
  // something to be done each time should take far longer than reading a clock does.
  std::function<void()> setUp = nullptr;
  std::function<void()> before = nullptr;
};

// What is measured in bytes instead of time, once: the work says how many.
struct Footprint {
  std::function<size_t()> bytes;
};

class Row {
 public:
  Row(const std::string &what, const Work &work);
  Row(const std::string &what, const Footprint &footprint);

  // At most `ratio` times what it is compared with, which is measured for this row, or has been
  // named by an earlier one.
  Row &atMost(double ratio, const std::string &what, const Work &work);
  Row &atMost(double ratio, const std::string &what, const Footprint &footprint);
  Row &atMost(double ratio, const std::string &what);

 private:
  std::string what_;
};

// Each program makes its rows here. Their names are unique in it.
void makeRows();

// Ends the program when something that is measured fails: what fails fast would look fast.
void orDie(bool ok, const char *what);

#endif
