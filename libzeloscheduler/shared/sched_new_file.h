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

// A file with a random name, beside the one that it is to replace, and removed unless it was
// renamed. The old file is never opened, nor a link in its place followed. Each call gives false,
// with errno set, when it fails.
class SchedNewFile {
 public:
  explicit SchedNewFile(const char *szBeside);
  ~SchedNewFile();
  SchedNewFile(const SchedNewFile &) = delete;
  SchedNewFile &operator=(const SchedNewFile &) = delete;

  const char *path() const { return path_; }

  bool open();
  bool write(std::string_view bytes);
  // Writes the file to the disk, with this owner, group and mode (only its permission bits),
  // before it is renamed. Nothing can be written after this.
  bool finish(const struct stat &like);
  // Does not sync the directory: schedSyncDirectory does.
  bool rename(const char *szPath);

 private:
  char path_[128];
  bool isMade_ = false;
  Stream stream_;
};

// The file, or the entries of the directory, are on the disk when the call returns.
bool schedSyncFile(const char *szPath);
bool schedSyncDirectory(const char *szPath);

#endif
