#include "json/run_json.h"

#include <json/json.h>

#include <ctime>

#include "json/json_out.h"

namespace {

Json::Value timeOrNull(const std::optional<int64_t> &moment) {
  return moment ? jsonTime(static_cast<time_t>(*moment)) : Json::Value();
}

template <class Number>
Json::Value numberOrNull(const std::optional<Number> &number) {
  return number ? Json::Value(*number) : Json::Value();
}

}  // namespace

Json::Value jsonOf(const RunRecord &run) {
  Json::Value object(Json::objectValue);
  // A run that the history does not have yet has no number.
  object["run"] = run.run > 0 ? Json::Value(Json::Int64(run.run)) : Json::Value();
  object["task"] = Json::Int64(run.task);
  object["task_name"] = jsonText(run.taskName);
  object["app"] = jsonTextOrNull(run.app);
  object["owner"] = jsonTextOrNull(run.owner);
  object["trigger"] = nameOf(run.trigger);
  object["due"] = timeOrNull(run.due);
  object["queued"] = timeOrNull(run.queued);
  object["start"] = timeOrNull(run.start);
  object["end"] = timeOrNull(run.end);
  object["duration_seconds"] = numberOrNull(run.duration);
  object["state"] = nameOf(run.state);
  object["outcome"] = jsonTextOrNull(nameOf(run.outcome));
  object["exit_code"] = numberOrNull(run.exitCode);
  object["signal"] = numberOrNull(run.signal);
  object["output_bytes"] = Json::Int64(run.outputBytes);
  return object;
}
