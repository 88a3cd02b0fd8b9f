// One row of the table that a benchmark program prints: something that the product does, and what
// it is compared with. Both are measured in one run, whose repetitions scripts/bench has
// interleaved at random, so that other load on the machine affects both. Ratios are of medians.
#ifndef BENCH_ROW_H
#define BENCH_ROW_H

#include <cstddef>
#include <functional>
#include <string>

struct Work {
  std::function<void()> work;
  // Not measured: `setUp` is called before each repetition, `before` before each call of `work`.
  // Work with a `before` is timed call by call, so it should take far longer than reading a clock.
  std::function<void()> setUp = nullptr;
  std::function<void()> before = nullptr;
};

// Measured in bytes, once, as `bytes` returns them.
struct Footprint {
  std::function<size_t()> bytes;
};

class Row {
 public:
  Row(const std::string &what, const Work &work);
  Row(const std::string &what, const Footprint &footprint);

  // At most `ratio` times what it is compared with: work that is given here, or named by an
  // earlier row.
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
