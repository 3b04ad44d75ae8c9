// A fault thrown into an operation at one point after the other, and what must
// hold whatever it hits.

#ifndef KELDOAUTH_TESTS_FAULTS_TRIALS_H
#define KELDOAUTH_TESTS_FAULTS_TRIALS_H

#include <memory>
#include <optional>
#include <string>
#include <tuple>

#include "tests/faults/scene.h"

namespace faults {

/// Something that goes wrong on a chosen occasion.
class Fault {
 public:
  virtual ~Fault() = default;

  /// The `nth` occasion from now on goes wrong (1 is the next); with `lasting`
  /// every later one, too.
  virtual void arm(int nth, bool lasting) = 0;
  virtual void disarm() = 0;
  /// Whether it came to that occasion.
  [[nodiscard]] virtual bool struck() const = 0;

  /// SQLite's code for what went wrong.
  [[nodiscard]] virtual int code() const = 0;
};

class Trials : public Scene {
 protected:
  /// Throws the fault into every occasion of the studied operation. Once: the
  /// object must then do its work. Lasting: the object ends with the fault in
  /// force. Leaves the number of trials in the test's record.
  void throwEverywhere(Fault& fault);

  /// Blocks of memory that are not SQLite's, where the program counts them.
  [[nodiscard]] virtual long blocks() const { return 0; }

 private:
  /// SQLite's bytes, open descriptors, blocks: the same before and after.
  using Holdings = std::tuple<long long, long, long>;

  bool throwAt(Fault& fault, int nth, bool lasting);
  /// False when an exception came out of the operation.
  bool perform();
  void judge(const Fault& fault);
  void judgeSuccess(const State& state);
  void judgeFailure(const Fault& fault, const State& state);
  void judgeError(const Fault& fault);
  void expectUsable();
  void expectNextObjectReady();
  [[nodiscard]] int place(const State& state) const;
  [[nodiscard]] bool isFinalButForEmptyValues(const State& state) const;
  [[nodiscard]] bool isPartlyPurged(const State& state) const;
  [[nodiscard]] Holdings holdings() const;

  std::shared_ptr<KELDOAUTHSERVER::OAUTHDBBasic> store_;
  std::optional<Answer> given_;
};

}  // namespace faults

#endif  // KELDOAUTH_TESTS_FAULTS_TRIALS_H
