// An open directory, which is closed at the end of its scope.
#pragma once

#include <dirent.h>

#include <memory>

struct CloseDirectory {
  void operator()(DIR *directory) const { closedir(directory); }
};

using Directory = std::unique_ptr<DIR, CloseDirectory>;
