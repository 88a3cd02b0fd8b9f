// A table of aligned columns. On a terminal, columns that may shrink give way until a line fits:
// what is too long for one then is cut, or goes on below.
#pragma once

#include <string>
#include <vector>

struct Column {
  const char *title;
  enum Alignment { kLeft, kRight } alignment = kLeft;
  bool shrinks = false;
  bool wraps = false;  // one that shrinks: goes on below instead of being cut
};

enum class Emphasis { kNone, kDim, kBad };

struct Cell {
  std::string text;  // made printable by the table
  Emphasis emphasis = Emphasis::kNone;
};

class Table {
 public:
  explicit Table(std::vector<Column> columns);

  void add(std::vector<Cell> row);
  bool empty() const { return rows_.empty(); }
  // The whole table as text, within so many columns (0: any number).
  std::string text(size_t columns, bool colour) const;
  // To the standard output, as wide as that is.
  void print() const;

 private:
  std::vector<Column> columns_;
  std::vector<std::vector<Cell>> rows_;
};
