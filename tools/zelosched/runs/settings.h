// How much is kept of the runs: /etc/zelosched.conf. Lines "name = value", and comments from '#'
// on. Without the file, or a line, the usual value holds.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

struct Settings {
  // Of what a run prints, in bytes.
  int64_t outputFirst = int64_t{16} << 10;
  int64_t outputLast = int64_t{48} << 10;
  int64_t outputRuns = 20;                  // so many runs of a task keep theirs
  int64_t outputTotal = int64_t{64} << 20;  // bytes of all runs together
  int64_t outputFreePercent = 5;            // none is kept while less of the file system is free
  int64_t runsOfTask = 200;
  int64_t runsTotal = 100000;
  int64_t runsDays = 9;  // none younger goes before the total is reached
};

// What is wrong with the file, a sentence a line of it; empty when nothing is.
using SettingsFaults = std::vector<std::string>;

// Lines that are wrong are ignored.
Settings readSettings(SettingsFaults *faults);

// For the tools: reports faults on standard error.
Settings settingsOrComplaints();
