// How zelosched ends.
#pragma once

inline constexpr int kDone = 0;
inline constexpr int kFailed = 1;
inline constexpr int kUsage = 2;
// Of 'apply --dry-run' alone: there is something to do.
inline constexpr int kToDo = 3;
// Of 'status' alone.
inline constexpr int kHealthUnknown = 3;
inline constexpr int kHealthCritical = 4;
