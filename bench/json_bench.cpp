// Converting a task to JSON, and back without the save, compared with JsonCpp alone writing and
// reading the same texts.
#include <zelocore.h>
#include <zelosched.h>

#include <cstring>
#include <string>
#include <utility>
#include <vector>

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
#include <json/json.h>

#include "support/row.h"
#include "support/stored_tasks.h"

namespace {

constexpr int kCapacity = 64;

using Members = std::vector<std::pair<std::string, std::string>>;

char json[ZELO_SCHED_JSON_SIZE_MIN];

Members membersOf(const ZELO_SCHED_TASK *task) {
  PSZHASH hash = QLIBCSzHashAlloc(kCapacity);
  PSZLIST keys = QLIBCSzListAlloc(kCapacity);
  orDie(ZELOSchedInitHashFromTask(&hash, task) == 0 && QLIBCSzHashEnumKey(hash, &keys) > 0,
        "ZELOSchedInitHashFromTask");
  Members members;
  for (int i = 0; i < QLIBCSzListCount(keys); ++i) {
    const char *key = QLIBCSzListGet(keys, i);
    members.emplace_back(key, QLIBCSzHashGetValue(hash, key));
  }
  QLIBCSzListFree(keys);
  QLIBCSzHashFree(hash);
  return members;
}

void writeMembers(const Members &members) {
  Json::FastWriter writer;
  Json::Value root(Json::objectValue);
  for (const auto &[key, value] : members) {
    root[key] = writer.write(Json::Value(value));
  }
  const std::string text = writer.write(root);
  memcpy(json, text.c_str(), text.size() + 1);
}

void readMembers() {
  Json::Reader reader;
  Json::Value root;
  orDie(reader.parse(json, root, false), "Json::Reader::parse");
  Members members;
  for (const std::string &name : root.getMemberNames()) {
    Json::Value inner;
    orDie(reader.parse(root[name].asString(), inner, false), "Json::Reader::parse");
    members.emplace_back(name, inner.asString());
  }
  orDie(!members.empty(), "reading the members");
}

using Operation = int (*)(ZELO_SCHED_TASK *);

// Operations of a backend that reads and writes no store.
int forget(ZELO_SCHED_TASK *task) {
  task->ID = 1;
  return 0;
}

void saveTo(Operation create, Operation get_default) {
  SchedBackends[0].create = create;
  SchedBackends[0].get_default = get_default;
  orDie(ZELOSchedTaskSaveFromJson(json, 1) == 1, "ZELOSchedTaskSaveFromJson");
}

}  // namespace

void makeRows() {
  constexpr double kMost = 1.2;
  fillStore(0);
  const ZELO_SCHED_TASK *task = newTask(1).release();  // never freed
  const Members members = membersOf(task);
  const Operation getDefault = SchedBackends[0].get_default;
  const auto convert = [task] {
    orDie(ZELOSchedTaskConvertToJson(task, json, sizeof(json)) == 0, "ZELOSchedTaskConvertToJson");
  };
  Row("ZELOSchedTaskConvertToJson", Work{convert})
      .atMost(kMost, "JsonCpp writing the same", Work{[members] { writeMembers(members); }});
  Row("ZELOSchedTaskSaveFromJson without the store", Work{[] { saveTo(forget, forget); }, convert})
      .atMost(kMost, "JsonCpp reading the same", Work{readMembers, convert});
  Row("... with a new task's defaults", Work{[getDefault] { saveTo(forget, getDefault); }, convert})
      .atMost(kMost, "JsonCpp reading the same");
}
#pragma GCC diagnostic pop
