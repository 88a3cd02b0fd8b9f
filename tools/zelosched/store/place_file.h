// Files that are put in place whole or not at all, wherever that is: what somebody else has planted
// under the name is neither followed nor taken over.
#pragma once

#include <sys/types.h>

#include <string>

// In the same directory as `path`, under a name that nobody can know; gone with the object, unless
// it was moved. Each call throws Failure.
class ScratchFile {
 public:
  explicit ScratchFile(const std::string &path);
  ~ScratchFile();
  ScratchFile(const ScratchFile &) = delete;
  ScratchFile &operator=(const ScratchFile &) = delete;

  const std::string &path() const { return path_; }
  void fill(const std::string &contents, mode_t mode);
  void moveTo(const std::string &path);

 private:
  std::string path_;
  int file_;
  bool isPlaced_ = false;
};

// Each throws Failure.

// Of a regular file, or of one that a link leads to.
std::string contentsOf(const std::string &path);

// The file, root's and with that mode, on the disk when the call returns. It replaces a file or a
// link of that name, but no directory.
void placeFile(const std::string &path, const std::string &contents, mode_t mode);
