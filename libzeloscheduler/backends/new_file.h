// Files that the backend of the store replaces or watches; failures set the error record.
#ifndef NEW_FILE_H
#define NEW_FILE_H

#include <sys/stat.h>
#include <zelocore.h>

#include <string_view>

#include "sched_new_file.h"
#include "sched_report.h"

// The new contents of a file, written line by line. Each call gives 0, or -1 with its code and the
// location in the error record.
class NewFile {
 public:
  NewFile(const char *szPath, SchedSourceLocation location)
      : file_(szPath), szPath_(szPath), location_(location) {}

  int open() { return file_.open() ? 0 : fail(kErrOpen); }

  int write(std::string_view bytes) {
    endsLine_ = bytes.ends_with('\n');
    return file_.write(bytes) ? 0 : fail(kErrIo);
  }

  // Copies the source from its current position to the end.
  int writeAllOf(FILE *source) {
    char block[1 << 14];
    size_t count = 0;
    while ((count = fread(block, 1, sizeof(block), source)) > 0) {
      if (write({block, count}) < 0) {
        return -1;
      }
    }
    return ferror(source) == 0 ? 0 : fail(kErrIo);
  }

  // Ends a last line that has no line feed before it adds one.
  int writeLine(const char *szLine) {
    if (!endsLine_ && write("\n") < 0) {
      return -1;
    }
    return write(szLine) < 0 ? -1 : write("\n");
  }

  int finish(const struct stat &like) { return file_.finish(like) ? 0 : fail(kErrIo); }
  int replaceOld() { return file_.rename(szPath_) ? 0 : fail(kErrRename); }

 private:
  int fail(int code) const {
    QLIBCErrSetEx(code, location_.file, location_.line);
    return -1;
  }

  SchedNewFile file_;
  const char *szPath_;
  SchedSourceLocation location_;
  bool endsLine_ = true;
};

// A file's length and time of modification, to find out whether it was written again.
class FileState {
 public:
  explicit FileState(const char *szPath) { stat(szPath, &info_); }

  bool isThatOf(const char *szPath) const {
    struct stat now = {};
    return stat(szPath, &now) == 0 && now.st_size == info_.st_size &&
           now.st_mtim.tv_sec == info_.st_mtim.tv_sec &&
           now.st_mtim.tv_nsec == info_.st_mtim.tv_nsec;
  }

 private:
  struct stat info_ = {};
};

#endif
