// Replacing a file as a whole, so that no reader sees a part of it.
#ifndef SCHED_NEW_FILE_H
#define SCHED_NEW_FILE_H

#include <stdio.h>
#include <sys/stat.h>

#include <memory>
#include <string_view>

struct FileCloser {
  void operator()(FILE *stream) const { fclose(stream); }
};
using Stream = std::unique_ptr<FILE, FileCloser>;

// A file under a name that nobody can know, beside the one whose place it is to take, and gone
// again unless it took it. What stands under that one's name is neither followed nor written
// through. Each call gives false, with errno set, when it fails.
class SchedNewFile {
 public:
  explicit SchedNewFile(const char *szBeside);
  ~SchedNewFile();
  SchedNewFile(const SchedNewFile &) = delete;
  SchedNewFile &operator=(const SchedNewFile &) = delete;

  const char *path() const { return path_; }

  bool open();
  bool write(std::string_view bytes);
  // Whole on the disk, and with this owner, group and mode (of which the permission bits count)
  // before anyone can find it. Nothing can be written behind it.
  bool finish(const struct stat &like);
  // The directory is left to schedSyncDirectory.
  bool rename(const char *szPath);

 private:
  char path_[128];
  bool isMade_ = false;
  Stream stream_;
};

// What was written, or what a rename made of a directory, is on the disk when the call returns.
bool schedSyncFile(const char *szPath);
bool schedSyncDirectory(const char *szPath);

#endif
