// Telling those who want to know that a run has ended: the programs in /etc/zelosched/run-ended.d.
#pragma once

#include "runs/history.h"

#define NOTICE_DIRECTORY "/etc/zelosched/run-ended.d"
inline constexpr char kNoticeDirectory[] = NOTICE_DIRECTORY;

// What mails failures when it is among those that are told.
inline constexpr char kMailProgram[] = NOTICE_DIRECTORY "/mail-on-failure";
inline constexpr char kMailer[] = "/usr/sbin/sendmail";
bool hasMailer();

// A program that is to be told, and why it cannot be, which is empty when it can.
struct NoticeProgram {
  std::string path;
  std::string fault;
};

// In the order of their names. Of a directory that is not root's alone, none but the directory.
std::vector<NoticeProgram> noticePrograms();

// How the program failed when it was last told since the machine was started; empty when it did
// not.
std::string lastFaultOf(const NoticeProgram &program);

// There is somebody to tell.
bool isAnybodyToBeTold();

// Runs each program that is root's alone, in the order of their names, with the record as
// environment variables ZELO_RUN_... and what was printed in a file whose name is one of them.
// Waits for each, and ends it with all its process group after 30 seconds. What is wrong with one
// is a line in the system log, and stays known until it is told again. `isRecovered`: it is the
// first that ended well after one that did not.
void tellOfEnd(const RunRecord &run, const Output &output, bool isRecovered);

// The same of a time at which a task was due and did not run. The outcome is "missed"; there is no
// run, and nothing was printed.
void tellOfMissed(const RunRecord &run);
