// MD5 after RFC 1321. Neither the phone's platform nor the host offers one without a new
// dependency, so it is small and kept here.
#include "services/md5.h"

#include <cstring>

namespace {

constexpr uint32_t kSine[64] = {
    0xd76aa478, 0xe8c7b756, 0x242070db, 0xc1bdceee, 0xf57c0faf, 0x4787c62a, 0xa8304613, 0xfd469501,
    0x698098d8, 0x8b44f7af, 0xffff5bb1, 0x895cd7be, 0x6b901122, 0xfd987193, 0xa679438e, 0x49b40821,
    0xf61e2562, 0xc040b340, 0x265e5a51, 0xe9b6c7aa, 0xd62f105d, 0x02441453, 0xd8a1e681, 0xe7d3fbc8,
    0x21e1cde6, 0xc33707d6, 0xf4d50d87, 0x455a14ed, 0xa9e3e905, 0xfcefa3f8, 0x676f02d9, 0x8d2a4c8a,
    0xfffa3942, 0x8771f681, 0x6d9d6122, 0xfde5380c, 0xa4beea44, 0x4bdecfa9, 0xf6bb4b60, 0xbebfbc70,
    0x289b7ec6, 0xeaa127fa, 0xd4ef3085, 0x04881d05, 0xd9d4d039, 0xe6db99e5, 0x1fa27cf8, 0xc4ac5665,
    0xf4292244, 0x432aff97, 0xab9423a7, 0xfc93a039, 0x655b59c3, 0x8f0ccc92, 0xffeff47d, 0x85845dd1,
    0x6fa87e4f, 0xfe2ce6e0, 0xa3014314, 0x4e0811a1, 0xf7537e82, 0xbd3af235, 0x2ad7d2bb, 0xeb86d391,
};
constexpr int kShift[4][4] = {{7, 12, 17, 22}, {5, 9, 14, 20}, {4, 11, 16, 23}, {6, 10, 15, 21}};

constexpr uint32_t rotl(uint32_t x, int n) { return (x << n) | (x >> (32 - n)); }

uint32_t load_le32(const uint8_t* p) {
  return uint32_t{p[0]} | uint32_t{p[1]} << 8 | uint32_t{p[2]} << 16 | uint32_t{p[3]} << 24;
}

void store_le32(uint8_t* p, uint32_t v) {
  for (int i = 0; i < 4; ++i) p[i] = static_cast<uint8_t>(v >> (8 * i));
}

template <int Round>
inline void step(uint32_t& a, uint32_t& b, uint32_t& c, uint32_t& d, const uint32_t x[16], int i) {
  uint32_t f;
  int k;
  if constexpr (Round == 0) {
    f = d ^ (b & (c ^ d));  // (b & c) | (~b & d)
    k = i;
  } else if constexpr (Round == 1) {
    f = c ^ (d & (b ^ c));  // (d & b) | (~d & c)
    k = (5 * i + 1) % 16;
  } else if constexpr (Round == 2) {
    f = b ^ c ^ d;
    k = (3 * i + 5) % 16;
  } else {
    f = c ^ (b | ~d);
    k = (7 * i) % 16;
  }
  const uint32_t rotated = rotl(a + f + kSine[i] + x[k], kShift[Round][i % 4]);
  a = d;
  d = c;
  c = b;
  b += rotated;
}

void transform(uint32_t state[4], const uint8_t block[64]) {
  uint32_t x[16];
  for (int i = 0; i < 16; ++i) x[i] = load_le32(block + 4 * i);
  uint32_t a = state[0], b = state[1], c = state[2], d = state[3];
  // One loop per round keeps the round function out of the inner loop; unrolled, every
  // shift, sine constant and word index becomes an immediate.
#pragma GCC unroll 16
  for (int i = 0; i < 16; ++i) step<0>(a, b, c, d, x, i);
#pragma GCC unroll 16
  for (int i = 16; i < 32; ++i) step<1>(a, b, c, d, x, i);
#pragma GCC unroll 16
  for (int i = 32; i < 48; ++i) step<2>(a, b, c, d, x, i);
#pragma GCC unroll 16
  for (int i = 48; i < 64; ++i) step<3>(a, b, c, d, x, i);
  state[0] += a;
  state[1] += b;
  state[2] += c;
  state[3] += d;
}

}  // namespace

void MD5_Init(MD5_CTX* context) {
  context->state[0] = 0x67452301;
  context->state[1] = 0xefcdab89;
  context->state[2] = 0x98badcfe;
  context->state[3] = 0x10325476;
  context->count = 0;
}

void md5_update(MD5_CTX* context, const void* data, size_t size) {
  auto in = static_cast<const uint8_t*>(data);
  size_t used = context->count % 64;
  context->count += size;
  if (used != 0) {
    const size_t take = size < 64 - used ? size : 64 - used;
    std::memcpy(context->buffer + used, in, take);
    in += take;
    size -= take;
    if (used + take < 64) return;
    transform(context->state, context->buffer);
  }
  for (; size >= 64; in += 64, size -= 64) transform(context->state, in);
  std::memcpy(context->buffer, in, size);
}

void MD5_Final(unsigned char digest[16], MD5_CTX* context) {
  uint8_t length[8];
  const uint64_t bits = context->count * 8;
  for (int i = 0; i < 8; ++i) length[i] = static_cast<uint8_t>(bits >> (8 * i));
  static constexpr uint8_t kPadding[64] = {0x80};
  const size_t used = context->count % 64;
  md5_update(context, kPadding, used < 56 ? 56 - used : 120 - used);
  md5_update(context, length, sizeof length);
  for (int i = 0; i < 4; ++i) store_le32(digest + 4 * i, context->state[i]);
  std::memset(context, 0, sizeof *context);
}
