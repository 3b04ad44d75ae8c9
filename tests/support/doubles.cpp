#include "tests/support/doubles.h"

#include <dlfcn.h>
#include <sys/syscall.h>
#include <sys/types.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <map>
#include <optional>
#include <string_view>
#include <utility>

#include "platform/keldcgi.h"
#include "platform/keldcore.h"
#include "tests/support/allocations.h"

namespace support {
namespace {

struct ClockState {
  std::optional<long long> fixed;
  int calls = 0;
  std::function<void()> onRead = {};
};
ClockState clockState;

struct PlatformState {
  int encryptCallsLeft = -1;  // below 0: never fails
  int decryptCallsLeft = -1;
  Platform::Cipher encrypt;
  Platform::Cipher decrypt;
  Platform::Address address;
  std::vector<std::string> encrypted;
  std::vector<std::string> decrypted;
};
PlatformState platformState;

struct IdState {
  bool faked = false;
  uid_t euid = 0;
  gid_t egid = 0;
  std::map<uid_t, int> refusedUids;
  std::map<gid_t, int> refusedGids;
  std::map<std::size_t, int> refusedCalls;  // by position in `calls`
  std::vector<std::string> calls;
};
IdState idState;

long long realSeconds() {
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  return static_cast<long long>(now.tv_sec);
}

/// False from the chosen call on.
bool works(int& callsLeft) {
  if (callsLeft < 0) return true;
  if (callsLeft == 0) return false;
  --callsLeft;
  return true;
}

/// What a platform function does when the result does not fit.
int writeText(std::string_view text, char* out, std::size_t size) {
  if (text.size() >= size) return 0;
  *std::copy(text.begin(), text.end(), out) = '\0';
  return 1;
}

int wrap(const char* text, char* out, std::size_t size) {
  return writeText("<" + std::string(text) + ">", out, size);
}

int unwrap(const char* text, char* out, std::size_t size) {
  const std::string_view cipher(text);
  if (cipher.size() < 2 || cipher.front() != '<' || cipher.back() != '>') return 0;
  return writeText(cipher.substr(1, cipher.size() - 2), out, size);
}

template <typename Function>
Function original(const char* name) {
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

std::string idCall(const char* name, id_t id) {
  return std::string(name) + "(-1, " + std::to_string(static_cast<int>(id)) + ", -1)";
}

int refuse(int error) {
  errno = error;
  return -1;
}

int switchFake(const std::map<id_t, int>& refused, id_t& current, id_t id) {
  const auto call = idState.refusedCalls.find(idState.calls.size() - 1);
  if (call != idState.refusedCalls.end()) return refuse(call->second);
  const auto refusal = refused.find(id);
  if (refusal != refused.end()) return refuse(refusal->second);
  current = id;
  return 0;
}

}  // namespace

void Clock::setTo(long long seconds) {
  clockState.fixed = seconds;
}
void Clock::advance(long long seconds) {
  setTo(clockState.fixed.value_or(realSeconds()) + seconds);
}
void Clock::release() {
  clockState = {};
}
void Clock::onRead(std::function<void()> body) {
  clockState.onRead = std::move(body);
}
int Clock::calls() {
  return clockState.calls;
}

void Platform::useCipher(Cipher encrypt, Cipher decrypt) {
  platformState.encrypt = std::move(encrypt);
  platformState.decrypt = std::move(decrypt);
}
void Platform::useAddress(Address address) {
  platformState.address = std::move(address);
}
void Platform::useReadableCipher() {
  useCipher(wrap, unwrap);
}
void Platform::failEncryptFrom(int call) {
  platformState.encryptCallsLeft = call - 1;
}
void Platform::failDecryptFrom(int call) {
  platformState.decryptCallsLeft = call - 1;
}
void Platform::answerRemoteIp(const std::string& text, int result) {
  useAddress([text, result](char* buffer, std::size_t size) {
    std::strncpy(buffer, text.c_str(), size - 1);
    return result;
  });
}
void Platform::release() {
  platformState = {};
}
std::vector<std::string> Platform::encrypted() {
  return platformState.encrypted;
}
std::vector<std::string> Platform::decrypted() {
  return platformState.decrypted;
}

void FakeIds::use(int euid, int egid) {
  idState = {};
  idState.faked = true;
  idState.euid = static_cast<uid_t>(euid);
  idState.egid = static_cast<gid_t>(egid);
}
void FakeIds::refuseUid(int id, int error) {
  idState.refusedUids[static_cast<uid_t>(id)] = error;
}
void FakeIds::refuseGid(int id, int error) {
  idState.refusedGids[static_cast<gid_t>(id)] = error;
}
void FakeIds::refuseCall(int nth, int error) {
  idState.refusedCalls[idState.calls.size() + static_cast<std::size_t>(nth) - 1] = error;
}
void FakeIds::release() {
  idState = {};
}
int FakeIds::euid() {
  return static_cast<int>(idState.euid);
}
int FakeIds::egid() {
  return static_cast<int>(idState.egid);
}
std::vector<std::string> FakeIds::calls() {
  return idState.calls;
}

}  // namespace support

using support::clockState;
using support::idState;
using support::platformState;

extern "C" {

time_t time(time_t* result) noexcept {
  ++clockState.calls;
  if (clockState.onRead) clockState.onRead();
  const auto now = static_cast<time_t>(clockState.fixed.value_or(support::realSeconds()));
  if (result != nullptr) *result = now;
  return now;
}

/// The form of gettimeofday that Debian's SQLite is linked against, on 32-bit
/// systems with 64-bit time, too.
struct LongTimeval {
  long seconds;
  long microseconds;
};
int gettimeofdayForSqlite(LongTimeval* result, void* zone) __asm__("gettimeofday");
int gettimeofdayForSqlite(LongTimeval* result, void* /*zone*/) {
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  result->seconds =
      static_cast<long>(clockState.fixed.value_or(static_cast<long long>(now.tv_sec)));
  result->microseconds = clockState.fixed.has_value() ? 0 : static_cast<long>(now.tv_nsec / 1000);
  return 0;
}

int KCORECryptSzEncrypt(const char* clear, char* out, size_t outSize) {
  const support::Uncounted uncounted;
  platformState.encrypted.emplace_back(clear);
  if (!support::works(platformState.encryptCallsLeft)) return 0;
  if (platformState.encrypt) return platformState.encrypt(clear, out, outSize);
  static const auto real = support::original<decltype(&KCORECryptSzEncrypt)>("KCORECryptSzEncrypt");
  return real(clear, out, outSize);
}

int KCORECryptSzDecrypt(const char* cipher, char* out, size_t outSize) {
  const support::Uncounted uncounted;
  platformState.decrypted.emplace_back(cipher);
  if (!support::works(platformState.decryptCallsLeft)) return 0;
  if (platformState.decrypt) return platformState.decrypt(cipher, out, outSize);
  static const auto real = support::original<decltype(&KCORECryptSzDecrypt)>("KCORECryptSzDecrypt");
  return real(cipher, out, outSize);
}

int KeldCgiGetRemoteIP(char* buffer, size_t size) {
  const support::Uncounted uncounted;
  if (platformState.address) return platformState.address(buffer, size);
  static const auto real = support::original<decltype(&KeldCgiGetRemoteIP)>("KeldCgiGetRemoteIP");
  return real(buffer, size);
}

uid_t geteuid() noexcept {
  return idState.faked ? idState.euid : support::original<uid_t (*)()>("geteuid")();
}

gid_t getegid() noexcept {
  return idState.faked ? idState.egid : support::original<gid_t (*)()>("getegid")();
}

int setresuid(uid_t real, uid_t effective, uid_t saved) noexcept {
  const support::Uncounted uncounted;
  idState.calls.push_back(support::idCall("setresuid", effective));
  if (idState.faked) {
    return support::switchFake(idState.refusedUids, idState.euid, effective);
  }
  return support::original<int (*)(uid_t, uid_t, uid_t)>("setresuid")(real, effective, saved);
}

int setresgid(gid_t real, gid_t effective, gid_t saved) noexcept {
  const support::Uncounted uncounted;
  idState.calls.push_back(support::idCall("setresgid", effective));
  if (idState.faked) {
    return support::switchFake(idState.refusedGids, idState.egid, effective);
  }
  return support::original<int (*)(gid_t, gid_t, gid_t)>("setresgid")(real, effective, saved);
}

}  // extern "C"
