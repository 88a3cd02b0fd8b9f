// Where the tasks are kept, and the program that cron starts for them.
#pragma once

inline constexpr char kWorkingCopy[] = "/tmp/scheduled_tasks";
inline constexpr char kPersistentCopy[] = "/usr/zelo/etc/scheduled_tasks";
// The persistent copy that was last put back from, or kept beside a working copy that stood.
inline constexpr char kLastGoodCopy[] = "/usr/zelo/etc/scheduled_tasks.last-good";

inline constexpr char kTaskProgram[] = "/tmp/zeloschedtask";
