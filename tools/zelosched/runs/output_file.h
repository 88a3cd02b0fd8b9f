// What a run has printed so far: its first bytes and its last ones, in a file in /run/zelosched
// that its keeper writes and root's other programs can read. It outlives a keeper that is killed,
// and its size is bounded.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "runs/history.h"

class OutputFile {
 public:
  // Creates the file for the run of that process. Where that fails it is a memfd, which others
  // cannot see. The file stays until remove(). Not isOpen() when there is no memfd either.
  static OutputFile make(const ProcessName &process, int64_t first, int64_t last);
  // The file of a run under way, to be read or appended to.
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
  // The bytes from `from` on, and in `lost` how many of them are not kept any more.
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
  std::string path_;  // empty for a memfd
  Header header_ = {};
};
