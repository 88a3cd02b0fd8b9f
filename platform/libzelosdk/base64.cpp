// Base64, over nettle.
#include <nettle/base64.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <limits>

#include "support.h"
#include "zelosdk.h"

namespace {

// nettle wants room as if every character were decoded, white space included. Decoding in steps
// keeps that room small and apart from the result.
constexpr size_t kStepCharacters = 256;
constexpr size_t kStepBytes = BASE64_DECODE_LENGTH(kStepCharacters);

bool fits(size_t sourceSize, size_t room) noexcept {
  return sourceSize < std::numeric_limits<size_t>::max() / 2 &&
         BASE64_ENCODE_RAW_LENGTH(sourceSize) < room;
}

bool decode(const char *text, size_t size, char *out, size_t room, size_t *decoded) noexcept {
  base64_decode_ctx context;
  base64_decode_init(&context);
  *decoded = 0;
  while (size > 0) {
    uint8_t step[kStepBytes];
    size_t count = sizeof step;
    const size_t taken = std::min(size, kStepCharacters);
    if (base64_decode_update(&context, &count, step, taken, text) == 0 || count > room - *decoded) {
      return false;
    }
    std::memcpy(out + *decoded, step, count);
    *decoded += count;
    text += taken;
    size -= taken;
  }
  return true;
}

}  // namespace

int SzBase64EncodeFull(const char *src, size_t cbSrc, char *dst, size_t cbDst, int /*reserved*/) {
  if (src == nullptr || dst == nullptr || !fits(cbSrc, cbDst)) {
    zelo::fail(QLIBC_ERR_BAD_PARAMETER);
    return 0;
  }
  base64_encode_raw(dst, cbSrc, reinterpret_cast<const uint8_t *>(src));
  dst[BASE64_ENCODE_RAW_LENGTH(cbSrc)] = '\0';
  return 1;
}

int ZELOEncodingBase64Decode(const char *src, size_t cbSrc, char *dst, size_t *pcbDst) {
  size_t decoded = 0;
  if (src == nullptr || dst == nullptr || pcbDst == nullptr ||
      !decode(src, cbSrc, dst, *pcbDst, &decoded)) {
    zelo::fail(QLIBC_ERR_BAD_PARAMETER);
    return 0;
  }
  *pcbDst = decoded;
  return 1;
}
