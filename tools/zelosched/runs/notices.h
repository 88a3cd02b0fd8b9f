// Notices of the ends of runs, by the programs in /etc/zelosched/run-ended.d.
#pragma once

#include "runs/history.h"

#define NOTICE_DIRECTORY "/etc/zelosched/run-ended.d"
inline constexpr char kNoticeDirectory[] = NOTICE_DIRECTORY;

// The program that mails failures, when it is there.
inline constexpr char kMailProgram[] = NOTICE_DIRECTORY "/mail-on-failure";
inline constexpr char kMailer[] = "/usr/sbin/sendmail";
bool hasMailer();

// A notice program, and why it is not run; empty when it is.
struct NoticeProgram {
  std::string path;
  std::string fault;
};

// In the order of their names. Where the directory is not root's alone, one entry for that.
std::vector<NoticeProgram> noticePrograms();

// How the program failed when it last ran since the boot; empty when it did not.
std::string lastFaultOf(const NoticeProgram &program);

// Whether there is a program to run.
bool isAnybodyToBeTold();

// Runs each program that is root's alone, in the order of their names, with the record as
// environment variables ZELO_RUN_... and what was printed in a file that one of these names. Waits
// for each, and kills its process group after 30 seconds. A fault is logged, and recorded until the
// program runs again. `isRecovered`: it is the first that ended well after one that did not.
void tellOfEnd(const RunRecord &run, const Output &output, bool isRecovered);

// The same of a time at which a task was due and did not run. The outcome is "missed"; there is no
// run, and nothing was printed.
void tellOfMissed(const RunRecord &run);
