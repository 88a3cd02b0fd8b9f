// Files that are put in place whole or not at all, wherever that is: what somebody else has planted
// under the name is neither followed nor taken over.
#pragma once

#include <sched_new_file.h>
#include <sys/types.h>

#include <string>

// Each throws Failure.

// Of a regular file, or of one that a link leads to.
std::string contentsOf(const std::string &path);

// Makes the file whole and on the disk, root's and with that mode.
void fill(SchedNewFile *file, const std::string &contents, mode_t mode);

// The file, root's and with that mode, on the disk when the call returns. It replaces a file or a
// link of that name, but no directory.
void placeFile(const std::string &path, const std::string &contents, mode_t mode);
