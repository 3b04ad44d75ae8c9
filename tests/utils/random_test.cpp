#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <boost/random/mersenne_twister.hpp>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <functional>
#include <new>
#include <random>
#include <set>
#include <system_error>
#include <thread>
#include <utility>

#include "tests/support/allocations.h"
#include "tests/support/world.h"
#include "tests/utils/kernel.h"
#include "utils/oauth_utils.h"

namespace {

using namespace KELDOAUTHSERVER;
using support::SystemLog;
using ::testing::AllOf;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::MatchesRegex;
using ::testing::SizeIs;

constexpr std::size_t kPiece = 32;
constexpr std::size_t kStateBytes = 624 * 4;

std::vector<std::string> pieces(const std::string& text) {
  std::vector<std::string> all;
  for (std::size_t at = 0; at < text.size(); at += kPiece) all.push_back(text.substr(at, kPiece));
  return all;
}

class RandomTest : public support::World {
 protected:
  void SetUp() override {
    World::SetUp();
    Kernel::release();
  }
  void TearDown() override {
    Kernel::release();
    World::TearDown();
  }

  /// Every byte that the system delivers is this one.
  static void systemDelivers(char byte) {
    Kernel::scriptGetrandom([byte](char* buffer, std::size_t size) {
      std::fill_n(buffer, size, byte);
      return static_cast<ssize_t>(size);
    });
  }

  /// As on a kernel that does not know getrandom(), or a sandbox that forbids it.
  static void leaveOnlyTheDevice(int error = ENOSYS) { Kernel::scriptGetrandom(failing(error)); }

  static Kernel::Read failing(int error) {
    return [error](char* /*buffer*/, std::size_t /*size*/) -> ssize_t {
      errno = error;
      return -1;
    };
  }

  static constexpr char kForm[] = "[0-9a-f]{12}4[0-9a-f]{3}[89ab][0-9a-f]{15}";
};

// Form ------------------------------------------------------------------------

struct Length {
  unsigned int asked;
  std::size_t given;
};

void PrintTo(const Length& length, std::ostream* out) {
  *out << length.asked;
}

class RandomLengthTest : public RandomTest, public ::testing::WithParamInterface<Length> {};

TEST_P(RandomLengthTest, IsRoundedUpToWholePieces) {
  EXPECT_EQ(getRandomStr(GetParam().asked).size(), GetParam().given);
}

const Length kLengths[] = {
    {0, 0},   {1, 32},  {10, 32}, {31, 32},   {32, 32},     {33, 64},
    {63, 64}, {64, 64}, {65, 96}, {128, 128}, {1000, 1024},
};

INSTANTIATE_TEST_SUITE_P(Utilities, RandomLengthTest, ::testing::ValuesIn(kLengths),
                         [](const auto& row) { return std::to_string(row.param.asked); });

TEST_F(RandomTest, EveryPieceIsAVersion4UuidWithoutDashes) {
  EXPECT_THAT(pieces(getRandomStr(32 * 500)), Each(MatchesRegex(kForm)));
}

TEST_F(RandomTest, EveryFreePositionTakesEveryDigit) {
  std::array<std::set<char>, kPiece> seen;
  for (const std::string& piece : pieces(getRandomStr(32 * 2000))) {
    for (std::size_t at = 0; at < kPiece; ++at) seen[at].insert(piece[at]);
  }
  for (std::size_t at = 0; at < kPiece; ++at) {
    const std::size_t digits = at == 12 ? 1 : at == 16 ? 4 : 16;
    EXPECT_EQ(seen[at].size(), digits) << "position " << at;
  }
}

// Freshness -------------------------------------------------------------------

TEST_F(RandomTest, NoPieceComesTwice) {
  const std::vector<std::string> all = pieces(getRandomStr(32 * 2000));
  EXPECT_THAT(std::set<std::string>(all.begin(), all.end()), SizeIs(2000));
}

TEST_F(RandomTest, NoPieceIsSharedBetweenCalls) {
  std::set<std::string> all;
  for (int call = 0; call < 500; ++call) {
    for (const std::string& piece : pieces(getRandomStr(64))) all.insert(piece);
  }
  EXPECT_THAT(all, SizeIs(1000));
}

TEST_F(RandomTest, NoPieceIsSharedBetweenThreads) {
  std::array<std::string, 8> texts;
  std::vector<std::thread> threads;
  for (std::string& text : texts) threads.emplace_back([&text] { text = getRandomStr(32 * 100); });
  for (std::thread& thread : threads) thread.join();

  std::set<std::string> all;
  for (const std::string& text : texts) {
    for (const std::string& piece : pieces(text)) all.insert(piece);
  }
  EXPECT_THAT(all, SizeIs(800));
}

TEST_F(RandomTest, ForkedProcessGoesItsOwnWay) {
  getRandomStr(32);
  std::array<int, 2> ends{};
  ASSERT_EQ(pipe(ends.data()), 0);
  const pid_t child = fork();
  if (child == 0) {
    const std::string text = getRandomStr(32);
    _exit(write(ends[1], text.data(), text.size()) == 32 ? 0 : 1);
  }
  std::string childs(kPiece, '\0');
  EXPECT_EQ(read(ends[0], childs.data(), childs.size()), 32);
  EXPECT_NE(getRandomStr(32), childs);
  EXPECT_EQ(waitpid(child, nullptr, 0), child);
  close(ends[0]);
  close(ends[1]);
}

// The random source -----------------------------------------------------------

TEST_F(RandomTest, NothingIsAskedForLengthZero) {
  EXPECT_EQ(getRandomStr(0), "");
  EXPECT_THAT(Kernel::getrandomCalls(), IsEmpty());
  EXPECT_EQ(Kernel::opened(Kernel::kRandomDevice), 0);
}

TEST_F(RandomTest, EveryPieceTakesAWholeStateInOneCall) {
  getRandomStr(32);
  EXPECT_THAT(Kernel::getrandomCalls(), ElementsAre(kStateBytes));
  getRandomStr(65);
  EXPECT_THAT(Kernel::getrandomCalls(), AllOf(SizeIs(4), Each(kStateBytes)));
  EXPECT_EQ(Kernel::opened(Kernel::kRandomDevice), 0);
}

/// A state of the generator, as the system delivers it.
using State = std::array<std::uint32_t, kStateBytes / 4>;

void systemDeliversState(const State& state) {
  Kernel::scriptGetrandom([&state](char* buffer, std::size_t size) -> ssize_t {
    if (size != sizeof state) return 0;
    std::memcpy(buffer, state.data(), size);
    return static_cast<ssize_t>(size);
  });
}

/// Hands a generator its state, word by word.
struct Seed {
  using result_type = std::uint_least32_t;
  const State& state;
  void generate(result_type* first, result_type* last) const {
    ASSERT_EQ(last - first, static_cast<std::ptrdiff_t>(state.size()));
    std::copy(state.begin(), state.end(), first);
  }
};

/// The piece that a whole Mersenne Twister, seeded with `state`, gives: the bytes
/// of its first four words, least significant first.
template <typename Generator>
std::string pieceOf(const State& state) {
  Seed seed{state};
  Generator generator;
  generator.seed(seed);
  std::array<std::uint8_t, 16> bytes{};
  for (std::size_t word = 0; word < 4; ++word) {
    const auto drawn = static_cast<std::uint32_t>(generator());
    for (std::size_t i = 0; i < 4; ++i)
      bytes[4 * word + i] = static_cast<std::uint8_t>(drawn >> 8 * i);
  }
  bytes[6] = static_cast<std::uint8_t>((bytes[6] & 0x0f) | 0x40);
  bytes[8] = static_cast<std::uint8_t>((bytes[8] & 0x3f) | 0x80);
  std::string piece;
  for (const std::uint8_t byte : bytes) {
    std::array<char, 3> hex{};
    std::snprintf(hex.data(), hex.size(), "%02x", byte);
    piece += hex.data();
  }
  return piece;
}

TEST_F(RandomTest, PieceIsWhatTheStandardGeneratorsGiveForThatState) {
  std::mt19937 random(20261121);
  State state{};
  systemDeliversState(state);
  for (int seed = 0; seed < 20000; ++seed) {
    std::generate(state.begin(), state.end(), std::ref(random));
    const std::string piece = getRandomStr(32);
    ASSERT_EQ(piece, pieceOf<std::mt19937>(state)) << "seed " << seed;
    ASSERT_EQ(piece, pieceOf<boost::random::mt19937>(state)) << "seed " << seed;
  }
}

/// The top bit of the first word is the only one of that word which counts.
TEST_F(RandomTest, StateOfZerosIsMendedAsTheStandardGeneratorsMendIt) {
  State state{};
  systemDeliversState(state);
  for (const std::uint32_t first : {0U, 1U, 0x7fffffffU, 0x80000000U, 0xffffffffU}) {
    state[0] = first;
    EXPECT_EQ(getRandomStr(32), pieceOf<std::mt19937>(state)) << first;
    EXPECT_EQ(getRandomStr(32), pieceOf<boost::random::mt19937>(state)) << first;
  }
}

/// A lone bit, wherever it stands, keeps the state from counting as zeros.
TEST_F(RandomTest, EveryWordOfTheStateIsLookedAt) {
  for (std::size_t word = 0; word < kStateBytes / 4; ++word) {
    State state{};
    state[word] = 0x80000000U;
    systemDeliversState(state);
    EXPECT_EQ(getRandomStr(32), pieceOf<std::mt19937>(state)) << "word " << word;
  }
}

TEST_F(RandomTest, EveryPieceHasAStateOfItsOwn) {
  std::array<State, 2> states{};
  states[0].fill(0x5a5a5a5aU);
  states[1].fill(0xa5a5a5a5U);
  std::size_t call = 0;
  Kernel::scriptGetrandom([&](char* buffer, std::size_t size) {
    std::memcpy(buffer, states.at(call++).data(), size);
    return static_cast<ssize_t>(size);
  });
  EXPECT_EQ(getRandomStr(64), pieceOf<std::mt19937>(states[0]) + pieceOf<std::mt19937>(states[1]));
}

TEST_F(RandomTest, FourDrawsMixNineWordsOfTheState) {
  systemDelivers(0x11);
  const std::string unchanged = getRandomStr(32);
  std::set<std::size_t> counting;
  for (std::size_t word = 0; word < kStateBytes / 4; ++word) {
    Kernel::scriptGetrandom([word](char* buffer, std::size_t size) {
      std::fill_n(buffer, size, 0x11);
      std::fill_n(buffer + 4 * word, 4, static_cast<char>(0xee));
      return static_cast<ssize_t>(size);
    });
    if (getRandomStr(32) != unchanged) counting.insert(word);
  }
  EXPECT_THAT(counting, ElementsAre(0, 1, 2, 3, 4, 397, 398, 399, 400));
}

TEST_F(RandomTest, ShortAnswersAreContinued) {
  systemDelivers(0x5a);
  const std::string atOnce = getRandomStr(32);
  Kernel::release();
  Kernel::scriptGetrandom([](char* buffer, std::size_t size) {
    const std::size_t got = std::min<std::size_t>(size, 1000);
    std::fill_n(buffer, got, 0x5a);
    return static_cast<ssize_t>(got);
  });
  EXPECT_EQ(getRandomStr(32), atOnce);
  EXPECT_THAT(Kernel::getrandomCalls(), ElementsAre(kStateBytes, kStateBytes - 1000, 496U));
}

TEST_F(RandomTest, InterruptedCallIsTakenUpAgain) {
  int calls = 0;
  Kernel::scriptGetrandom([&calls](char* buffer, std::size_t size) -> ssize_t {
    if (++calls < 3) {
      errno = EINTR;
      return -1;
    }
    std::fill_n(buffer, size, 0x5a);
    return static_cast<ssize_t>(size);
  });
  EXPECT_EQ(getRandomStr(32).size(), kPiece);
  EXPECT_THAT(Kernel::getrandomCalls(), SizeIs(3));
}

TEST_F(RandomTest, WhereTheCallIsNotToBeHadTheDeviceDeliversTheSame) {
  for (const int error : {ENOSYS, EPERM}) {
    Kernel::release();
    leaveOnlyTheDevice(error);
    EXPECT_THAT(pieces(getRandomStr(64)), AllOf(SizeIs(2), Each(MatchesRegex(kForm))));
    EXPECT_EQ(Kernel::opened(Kernel::kRandomDevice), 2);
    EXPECT_THAT(Kernel::deviceReads(), ElementsAre(kStateBytes, kStateBytes));
    EXPECT_EQ(Kernel::openDevices(), 0);
  }
}

// Failure ---------------------------------------------------------------------

/// The error that getRandomStr throws; 0 when it does not.
int errorOfRandomStr() {
  try {
    getRandomStr(64);
  } catch (const std::system_error& thrown) {
    return thrown.code().value();
  }
  return 0;
}

TEST_F(RandomTest, FailingCallPassesToTheCaller) {
  Kernel::scriptGetrandom(failing(EFAULT));
  EXPECT_EQ(errorOfRandomStr(), EFAULT);
}

TEST_F(RandomTest, SourceThatDeliversNothingIsAFailure) {
  Kernel::scriptGetrandom([](char* /*buffer*/, std::size_t /*size*/) -> ssize_t { return 0; });
  EXPECT_EQ(errorOfRandomStr(), EIO);
}

TEST_F(RandomTest, NothingIsAFailureWhateverErrnoSaid) {
  bool isFirst = true;
  Kernel::scriptGetrandom([&](char* buffer, std::size_t size) -> ssize_t {
    errno = EINTR;
    if (std::exchange(isFirst, false)) return 0;
    std::fill_n(buffer, size, 'x');
    return static_cast<ssize_t>(size);
  });
  EXPECT_EQ(errorOfRandomStr(), EIO);
}

TEST_F(RandomTest, FailingDevicePassesToTheCallerAndIsClosed) {
  leaveOnlyTheDevice();
  Kernel::scriptRandomDevice(failing(EPERM));
  EXPECT_EQ(errorOfRandomStr(), EPERM);
  EXPECT_EQ(Kernel::openDevices(), 0);
}

TEST_F(RandomTest, NoSourceAtAllIsAFailure) {
  leaveOnlyTheDevice();
  Kernel::refuseRandomDevice(ENOENT);
  EXPECT_EQ(errorOfRandomStr(), ENOENT);
}

TEST_F(RandomTest, MissingMemoryPassesToTheCaller) {
  std::string text = "untouched";
  bool thrown = false;
  {
    const support::FailingAllocation outOfMemory(1);
    try {
      text = getRandomStr(64);
    } catch (const std::bad_alloc&) {
      thrown = true;
    }
  }
  EXPECT_TRUE(thrown);
  EXPECT_EQ(text, "untouched");
}

TEST_F(RandomTest, NothingIsLogged) {
  withDiagnostics(-1, [] { getRandomStr(64); });
  Kernel::scriptGetrandom(failing(EFAULT));
  EXPECT_NE(errorOfRandomStr(), 0);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

}  // namespace
