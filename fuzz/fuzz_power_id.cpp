// Any number as the id of a power task: its entry gives the id back, or it has none.
#include "backends/power_id.h"
#include "fuzz_input.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  FuzzInput input(data, size);
  const long id = input.number<long>();
  const std::optional<PowerTime> time = powerTimeOf(id);
  require(time.has_value() == isPowerId(id));
  if (time) {
    const std::optional<long> back = powerIdOf(*time);
    require(!back || powerTimeOf(*back) == *time);
  }
  const PowerTime any{static_cast<int>(input.number<uint8_t>() % 2),
                      {input.number<uint8_t>(), input.number<uint8_t>(), input.number<uint8_t>(),
                       input.number<uint8_t>()}};
  const std::optional<long> made = powerIdOf(any);
  require(!made || powerTimeOf(*made) == any);
  return 0;
}
