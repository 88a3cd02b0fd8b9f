// json_tasks write COUNT   COUNT random tasks, each as a line of its JSON text and a line with its
//                          text fields as they are in the record, "KEY=HEX KEY=HEX ..."
// json_tasks save          saves each line of standard input, which is a JSON text, as a new task,
//                          prints it as JSON, as it was stored, and removes the task
#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iostream>
#include <random>
#include <string>

#include "zelosched.h"

namespace {

struct TextField {
  const char *key;
  size_t offset;
  size_t capacity;
};

#define TEXT_FIELD(key, name) \
  { key, offsetof(ZELO_SCHED_TASK, name), sizeof(ZELO_SCHED_TASK::name) }

constexpr TextField kTextFields[] = {
    TEXT_FIELD("name", Name),
    TEXT_FIELD("week", Week),
    TEXT_FIELD("app", App),
    TEXT_FIELD("app_name", AppName),
    TEXT_FIELD("app_args", AppArgs),
    TEXT_FIELD("action", Action),
    TEXT_FIELD("edit_form", EditForm),
    TEXT_FIELD("edit_dialog", EditDialog),
    TEXT_FIELD("cmd", Command),
};

char *textOf(ZELO_SCHED_TASK *task, const TextField &field) {
  return reinterpret_cast<char *>(task) + field.offset;
}

std::string anyBytes(std::mt19937 &random, size_t length) {
  std::string text;
  while (text.size() < length) text += static_cast<char>(1 + random() % 255);
  return text;
}

std::string utf8(unsigned number) {
  const auto byte = [](unsigned bits) { return static_cast<char>(bits); };
  const auto further = [&](unsigned shift) { return byte(0x80 | ((number >> shift) & 0x3F)); };
  if (number < 0x80) return {byte(number)};
  if (number < 0x800) return {byte(0xC0 | (number >> 6)), further(0)};
  if (number < 0x10000) return {byte(0xE0 | (number >> 12)), further(6), further(0)};
  return {byte(0xF0 | (number >> 18)), further(12), further(6), further(0)};
}

std::string anyCharacters(std::mt19937 &random, size_t length) {
  constexpr unsigned kEnds[] = {0x80, 0x800, 0x10000, 0x110000};
  std::string text;
  while (text.size() < length) {
    const unsigned number = 1 + static_cast<unsigned>(random() % (kEnds[random() % 4] - 1));
    if (number < 0xD800 || number > 0xDFFF) text += utf8(number);
  }
  return text;
}

std::string delicateText(std::mt19937 &random, size_t length) {
  constexpr char kPieces[] = "\"\\/\n\t\b\x7F\xC3\xA9\xE2\xED\xF0ux0{}[]:,";
  std::string text;
  while (text.size() < length) text += kPieces[random() % (sizeof(kPieces) - 1)];
  return text;
}

void fill(std::mt19937 &random, char *text, size_t capacity) {
  constexpr size_t kUsualLength = 60;
  const size_t longest = random() % 10 == 0 ? capacity - 1 : std::min(capacity - 1, kUsualLength);
  const size_t length = random() % (longest + 1);
  const unsigned kind = static_cast<unsigned>(random() % 3);
  const std::string content = kind == 0   ? anyBytes(random, length)
                              : kind == 1 ? anyCharacters(random, length)
                                          : delicateText(random, length);
  snprintf(text, capacity, "%s", content.c_str());
}

void printFields(ZELO_SCHED_TASK *task) {
  for (const TextField &field : kTextFields) {
    printf("%s=", field.key);
    for (const char *c = textOf(task, field); *c != '\0'; ++c) {
      printf("%02x", static_cast<unsigned>(static_cast<unsigned char>(*c)));
    }
    printf(" ");
  }
  printf("\n");
}

int writeTasks(long count) {
  constexpr unsigned kSeed = 20130507;
  std::mt19937 random(kSeed);
  std::string json(ZELO_SCHED_JSON_SIZE_ANY, '\0');
  ZELO_SCHED_TASK *task = ZELOSchedTaskAlloc();
  for (long i = 0; task != nullptr && i < count; ++i) {
    for (const TextField &field : kTextFields) fill(random, textOf(task, field), field.capacity);
    if (ZELOSchedTaskConvertToJson(task, json.data(), json.size()) != 0) return EXIT_FAILURE;
    printf("%s", json.c_str());
    printFields(task);
  }
  return task != nullptr ? ZELOSchedTaskFree(task) : EXIT_FAILURE;
}

int saveTasks() {
  std::string json(ZELO_SCHED_JSON_SIZE_ANY, '\0');
  for (std::string line; std::getline(std::cin, line);) {
    const int id = ZELOSchedTaskSaveFromJson(line.c_str(), 1);
    if (id < 0 || ZELOSchedTaskConvertToJsonById(id, json.data(), json.size()) != 0 ||
        ZELOSchedTaskRemove(id) != 0) {
      return EXIT_FAILURE;
    }
    printf("%s", json.c_str());
  }
  return EXIT_SUCCESS;
}

}  // namespace

int main(int argc, char **argv) {
  if (argc == 3 && strcmp(argv[1], "write") == 0) return writeTasks(atol(argv[2]));
  if (argc == 2 && strcmp(argv[1], "save") == 0) return saveTasks();
  fprintf(stderr, "usage: json_tasks write COUNT | json_tasks save\n");
  return 2;
}
