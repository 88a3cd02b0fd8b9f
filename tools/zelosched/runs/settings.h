// How much is kept of the runs: /etc/zelosched.conf. Lines "name = value", and comments from '#'
// on. Without the file, or a line, the usual value holds.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

struct Settings {
  // Of what a run prints, in bytes.
  long outputFirst = 16L << 10;
  long outputLast = 48L << 10;
  long outputRuns = 20;          // so many runs of a task keep theirs
  long outputTotal = 64L << 20;  // bytes of all runs together
  long outputFreePercent = 5;    // none is kept while less of the file system is free
  long runsOfTask = 200;
  long runsTotal = 100000;
  long runsDays = 9;  // none younger goes before the total is reached
};

// What is wrong with the file, a sentence a line of it; empty when nothing is.
using SettingsFaults = std::vector<std::string>;

// Lines that are wrong are passed over.
Settings readSettings(SettingsFaults *faults);

// For the tools: what is wrong is said on standard error.
Settings settingsOrComplaints();
