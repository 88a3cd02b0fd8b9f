// Files that are replaced atomically, in any directory: a link or a file that another user put
// under the name is neither followed nor written to.
#pragma once

#include <sched_new_file.h>
#include <sys/types.h>

#include <string>

// Each throws Failure.

// The contents of a regular file, also through a symbolic link.
std::string contentsOf(const std::string &path);
// Nothing where that fails.
std::string contentsIfReadable(const std::string &path);

// Writes the new file to the disk, owned by root and with that mode.
void fill(SchedNewFile *file, const std::string &contents, mode_t mode);

// Replaces a file or a link, but no directory, by a file of root's with that mode, which is on the
// disk when the call returns.
void placeFile(const std::string &path, const std::string &contents, mode_t mode);
