// What a run has printed so far: its first bytes and its last ones, in a file in /run/zelosched
// that its keeper writes and others may look at. It outlives a keeper that is killed, takes none of
// its memory, and has a bound whatever the run prints.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "runs/history.h"

class OutputFile {
 public:
  // A new one for the run of that process. Where none can be made it is in memory, and others
  // cannot see it. It is there until it is removed. Not isOpen() when there is not even memory.
  static OutputFile make(const ProcessName &process, int64_t first, int64_t last);
  // That of a run that goes on, to be read, or to be written on.
  static OutputFile open(const ProcessName &process);

  OutputFile() = default;
  ~OutputFile();
  OutputFile(OutputFile &&other) noexcept;
  OutputFile &operator=(OutputFile &&other) noexcept;
  OutputFile(const OutputFile &) = delete;
  OutputFile &operator=(const OutputFile &) = delete;

  bool isOpen() const { return file_ >= 0; }
  void append(std::string_view bytes);
  void remove();

  // Bytes that were printed, kept or not.
  int64_t total() const;
  Output contents() const;
  // Those from `from` on, and of those that are not there any more, how many.
  std::string since(int64_t from, int64_t *lost) const;

 private:
  struct Header {
    char magic[8];
    int64_t first;
    int64_t last;
    int64_t total;
  };
  bool readHeader(Header *header) const;
  std::string read(const Header &header, int64_t from, int64_t to) const;

  int file_ = -1;
  std::string path_;  // none of one in memory
  Header header_ = {};
};
