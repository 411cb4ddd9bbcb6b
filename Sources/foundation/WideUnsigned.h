#pragma once
// Unsigned integers wider than a machine word, for the exact intermediates of Decimal's arithmetic.
// Only Decimal.cpp uses them.
#include <bit>
#include <cstdint>
#include <type_traits>

namespace wide {

using u128 = unsigned __int128;
using u64 = std::uint64_t;
using u32 = std::uint32_t;

// (high * 2^64 + low) / divisor, for high < divisor so that the quotient fits one word.
constexpr u64 divideWord(u64 high, u64 low, u64 divisor, u64& remainder) {
#if defined(__x86_64__)
  if (!std::is_constant_evaluated()) {
    u64 quotient;
    asm("divq %[d]" : "=a"(quotient), "=d"(remainder) : [d] "rm"(divisor), "a"(low), "d"(high));
    return quotient;
  }
#endif
  const u128 current = (u128(high) << 64) | low;
  const u64 quotient = u64(current / divisor);
  remainder = u64(current - u128(quotient) * divisor);
  return quotient;
}

// Unsigned 256-bit integer, just wide enough for every exact intermediate: a product of two 38-digit
// coefficients (76 digits), a dividend widened to 77 digits and an aligned sum of at most 77 digits
// (10^77 < 2^256).
struct U256 {
  u64 w[4] = {0, 0, 0, 0};  // least significant word first

  static constexpr U256 from(u128 v) {
    U256 r;
    r.w[0] = u64(v);
    r.w[1] = u64(v >> 64);
    return r;
  }

  static constexpr U256 product(u128 a, u128 b) {
    const u64 a0 = u64(a), a1 = u64(a >> 64), b0 = u64(b), b1 = u64(b >> 64);
    if (a1 == 0 && b1 == 0) return from(u128(a0) * b0);
    const u128 p00 = u128(a0) * b0, p01 = u128(a0) * b1, p10 = u128(a1) * b0, p11 = u128(a1) * b1;
    const u128 middle = (p00 >> 64) + u64(p01) + u64(p10);
    const u128 high = (middle >> 64) + (p01 >> 64) + (p10 >> 64) + p11;
    U256 r;
    r.w[0] = u64(p00);
    r.w[1] = u64(middle);
    r.w[2] = u64(high);
    r.w[3] = u64(high >> 64);
    return r;
  }

  constexpr bool isZero() const { return (w[0] | w[1] | w[2] | w[3]) == 0; }
  constexpr bool fitsU128() const { return (w[2] | w[3]) == 0; }
  constexpr u128 low() const { return (u128(w[1]) << 64) | w[0]; }

  constexpr int bitLength() const {
    for (int i = 3; i >= 0; --i)
      if (w[i] != 0) return 64 * i + 64 - std::countl_zero(w[i]);
    return 0;
  }

  constexpr int compare(const U256& other) const {
    for (int i = 3; i >= 0; --i)
      if (w[i] != other.w[i]) return w[i] < other.w[i] ? -1 : 1;
    return 0;
  }

  constexpr void add(const U256& other) {
    u128 carry = 0;
    for (int i = 0; i < 4; ++i) {
      const u128 t = u128(w[i]) + other.w[i] + carry;
      w[i] = u64(t);
      carry = t >> 64;
    }
  }

  // Requires other <= *this.
  constexpr void subtract(const U256& other) {
    u64 borrow = 0;
    for (int i = 0; i < 4; ++i) {
      const u64 t = w[i] - other.w[i] - borrow;
      borrow = (w[i] < other.w[i] || (w[i] == other.w[i] && borrow)) ? 1 : 0;
      w[i] = t;
    }
  }

  // The callers' digit bounds keep the product below 2^256.
  constexpr void multiplySmall(u64 factor) {
    u128 carry = 0;
    for (int i = 0; i < 4; ++i) {
      const u128 t = u128(w[i]) * factor + carry;
      w[i] = u64(t);
      carry = t >> 64;
    }
  }

  // Quotient in place; returns the remainder. divisor != 0.
  constexpr u64 divideSmall(u64 divisor) {
    u64 remainder = 0;
    for (int i = 3; i >= 0; --i) {
      if (remainder == 0 && w[i] < divisor) {  // leading words: nothing to divide yet
        remainder = w[i];
        w[i] = 0;
        continue;
      }
      w[i] = divideWord(remainder, w[i], divisor, remainder);
    }
    return remainder;
  }

  // Quotient in place; returns the remainder. divisor != 0.
  u128 divide(u128 divisor) { return (divisor >> 64) == 0 ? divideSmall(u64(divisor)) : divideWide(divisor); }

  // Knuth's algorithm D (TAOCP 4.3.1) on 32-bit digits for a divisor of three or four digits.
  u128 divideWide(u128 divisor) {
    u32 u[8], v[4];
    for (int i = 0; i < 4; ++i) {
      u[2 * i] = u32(w[i]);
      u[2 * i + 1] = u32(w[i] >> 32);
      v[i] = u32(divisor >> (32 * i));
    }
    int n = 4;
    while (v[n - 1] == 0) --n;
    int m = 8;
    while (m > 0 && u[m - 1] == 0) --m;
    if (m < n) {  // the dividend is already the remainder
      const u128 remainder = low();
      *this = U256{};
      return remainder;
    }

    // Normalise so that the divisor's top digit has its high bit set; the dividend gains a digit.
    const int s = std::countl_zero(v[n - 1]);
    u32 vn[4] = {}, un[9] = {}, q[8] = {};
    for (int i = n - 1; i > 0; --i) vn[i] = (v[i] << s) | u32(u64(v[i - 1]) >> (32 - s));
    vn[0] = v[0] << s;
    un[m] = u32(u64(u[m - 1]) >> (32 - s));
    for (int i = m - 1; i > 0; --i) un[i] = (u[i] << s) | u32(u64(u[i - 1]) >> (32 - s));
    un[0] = u[0] << s;

    constexpr u64 base = u64(1) << 32;
    for (int j = m - n; j >= 0; --j) {
      // Estimate the quotient digit from the top two digits, then correct it (at most twice).
      const u64 top = (u64(un[j + n]) << 32) | un[j + n - 1];
      u64 qhat = top / vn[n - 1];
      u64 rhat = top - qhat * vn[n - 1];
      while (qhat >= base || qhat * vn[n - 2] > ((rhat << 32) | un[j + n - 2])) {
        --qhat;
        rhat += vn[n - 1];
        if (rhat >= base) break;
      }
      // Multiply and subtract.
      std::int64_t borrow = 0, t = 0;
      for (int i = 0; i < n; ++i) {
        const u64 p = qhat * vn[i];
        t = std::int64_t(un[i + j]) - borrow - std::int64_t(p & 0xFFFFFFFFu);
        un[i + j] = u32(t);
        borrow = std::int64_t(p >> 32) - (t >> 32);
      }
      t = std::int64_t(un[j + n]) - borrow;
      un[j + n] = u32(t);
      q[j] = u32(qhat);
      if (t < 0) {  // the estimate was one too large: add the divisor back
        --q[j];
        u64 carry = 0;
        for (int i = 0; i < n; ++i) {
          const u64 sum = u64(un[i + j]) + vn[i] + carry;
          un[i + j] = u32(sum);
          carry = sum >> 32;
        }
        un[j + n] = u32(un[j + n] + carry);
      }
    }

    u128 remainder = 0;
    for (int i = n - 1; i >= 0; --i) {
      const u32 digit = (un[i] >> s) | u32(i == n - 1 ? 0 : u64(un[i + 1]) << (32 - s));
      remainder = (remainder << 32) | digit;
    }
    for (int i = 0; i < 4; ++i) w[i] = (u64(q[2 * i + 1]) << 32) | q[2 * i];
    return remainder;
  }
};

}  // namespace wide
