#include <fcntl.h>
#include <sys/random.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <string>
#include <system_error>

#include "utils/file.h"
#include "utils/oauth_utils.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

// The random source ---------------------------------------------------------

[[noreturn]] void throwNoRandomness(int error) {
  throw std::system_error(error, std::generic_category(), "system random source");
}

/// One call to the kernel; where it is not to be had, there is the device.
void fillFromSystem(char* out, std::size_t size) {
  for (std::size_t filled = 0; filled < size;) {
    ssize_t got = getrandom(out + filled, size - filled, 0);
    if (got < 0 && (errno == ENOSYS || errno == EPERM)) {
      const File device("/dev/urandom", O_RDONLY);
      if (!device.isOpen()) throwNoRandomness(errno);
      got = device.readSome(out + filled, size - filled);
    }
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) throwNoRandomness(errno);
    if (got == 0) throwNoRandomness(EIO);
    filled += static_cast<std::size_t>(got);
  }
}

// The generator -------------------------------------------------------------

using Word = std::uint32_t;

constexpr Word kTopBit = 0x80000000U;
constexpr std::size_t kStateWords = 624;
constexpr std::size_t kPartner = 397;

using State = std::array<Word, kStateWords>;

State readState() {
  State state;
  fillFromSystem(reinterpret_cast<char*>(state.data()), sizeof state);

  // Out of nothing but zeros would come zeros for ever, so that a generator
  // that is seeded with them starts from this one bit. The lower bits of the
  // first word take part in no draw.
  const bool isBarren = (state[0] & kTopBit) == 0 &&
                        std::all_of(state.begin() + 1, state.end(), [](Word w) { return w == 0; });
  if (isBarren) state[0] = kTopBit;
  return state;
}

/// What std::mt19937 in the state `before` draws as its `n`-th word, counted from
/// 0. That generator first replaces its whole state, word after word: each by
/// its top bit, the lower bits of the next word, and the word 397 further on.
/// The first 227 find all three as they were before, and so stand alone.
template <std::size_t n>
Word draw(const State& before) {
  static_assert(n + kPartner < kStateWords, "needs words that are replaced by then");
  const Word pair = (before[n] & kTopBit) | (before[n + 1] & ~kTopBit);
  Word word = before[n + kPartner] ^ (pair >> 1U) ^ ((pair & 1U) != 0 ? 0x9908b0dfU : 0U);

  word ^= word >> 11U;
  word ^= (word << 7U) & 0x9d2c5680U;
  word ^= (word << 15U) & 0xefc60000U;
  return word ^ (word >> 18U);
}

// Pieces --------------------------------------------------------------------

std::array<std::uint8_t, 16> drawUuid() {
  const State state = readState();
  const Word words[] = {draw<0>(state), draw<1>(state), draw<2>(state), draw<3>(state)};

  std::array<std::uint8_t, 16> uuid{};
  for (std::size_t i = 0; i < uuid.size(); ++i) {
    uuid[i] = static_cast<std::uint8_t>(words[i / 4] >> (8 * (i % 4)));
  }
  uuid[8] = static_cast<std::uint8_t>((uuid[8] & 0xBFU) | 0x80U);  // variant of RFC 4122
  uuid[6] = static_cast<std::uint8_t>((uuid[6] & 0x4FU) | 0x40U);  // version 4
  return uuid;
}

void appendHex(std::string& text, std::uint8_t byte) {
  constexpr char kDigits[] = "0123456789abcdef";
  text += kDigits[byte >> 4U];
  text += kDigits[byte & 0x0FU];
}

}  // namespace

std::string getRandomStr(unsigned int length) {
  std::string text;
  while (text.size() < length) {
    for (const std::uint8_t byte : drawUuid()) appendHex(text, byte);
  }
  return text;
}

}  // namespace KELDOAUTHSERVER
