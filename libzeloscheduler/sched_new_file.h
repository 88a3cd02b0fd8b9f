// Replacing a file as a whole, line by line, so that nobody ever sees half of it.
#ifndef SCHED_NEW_FILE_H
#define SCHED_NEW_FILE_H

#include <stdio.h>
#include <sys/stat.h>

#include <memory>

#include "sched_report.h"

struct FileCloser {
  void operator()(FILE *stream) const { fclose(stream); }
};
using Stream = std::unique_ptr<FILE, FileCloser>;

// A file made beside another one, gone again unless it took the other one's place. Each call gives
// 0, or -1 with its code at the place in the error record.
class NewFile {
 public:
  // The path must stay as long as this does.
  NewFile(const char *szPath, SchedPlace place);
  ~NewFile();
  NewFile(const NewFile &) = delete;
  NewFile &operator=(const NewFile &) = delete;

  int open();
  int write(const char *bytes, size_t count);
  // All that is left to be read.
  int writeAllOf(FILE *source);
  // A line must not be joined to a last line that has no line feed.
  int endLine() { return endsLine_ ? 0 : write("\n", 1); }
  // Whole on the disk and the old file's in owner and mode before anyone can see it.
  int finish(const struct stat &old);
  int replaceOld();

 private:
  int fail(int code) const;

  const char *szPath_;
  SchedPlace place_;
  char path_[64];
  bool made_ = false;
  bool endsLine_ = true;
  Stream stream_;
};

// What was written, or what a rename made of a directory, is on the disk when the call returns.
bool schedSyncFile(const char *szPath);
bool schedSyncDirectory(const char *szPath);

// A file's length and when it was written, by which one that was written again is told.
class FileState {
 public:
  explicit FileState(const char *szPath);
  bool isThatOf(const char *szPath) const;

 private:
  struct stat info_ = {};
};

#endif
