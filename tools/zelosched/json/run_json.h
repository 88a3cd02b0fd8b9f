// A run in the JSON format that zelosched-json(5) describes.
#pragma once

#include "runs/run_record.h"

namespace Json {
class Value;
}

Json::Value jsonOf(const RunRecord &run);
