// The fixture of the fault programs: a furnished state folder, an operation of
// which is known what it leaves behind, and an eye on what a fault left.

#ifndef KELDOAUTH_TESTS_FAULTS_SCENE_H
#define KELDOAUTH_TESTS_FAULTS_SCENE_H

#include <map>
#include <string>
#include <vector>

#include "tests/faults/every_operation.h"
#include "tests/support/world.h"

namespace faults {

/// What a database holds: the rows of each table as text.
using State = std::map<std::string, std::string>;

struct Inspection {
  State state;
  std::string integrity;  // "ok", or what SQLite finds wrong
};

class Scene : public support::World {
 protected:
  /// With a umask that takes nothing away, so that what is private is so by the
  /// library's own doing.
  void SetUp() override;
  void TearDown() override;

  /// Furnishes the folder for `operation` and lets it happen once, undisturbed,
  /// to learn its answer and every state that the file passes through.
  void study(const Operation& operation);

  /// Puts folder, clock, cipher and log back as they were before it happened.
  void reset();

  /// What a process that opened the files now would find. It looks at a copy,
  /// so that the files stay as they are.
  [[nodiscard]] Inspection inspect() const;

  /// The state in the order of the operation's, -1 when it is none of them. The
  /// last one that fits, for a state may occur twice.
  [[nodiscard]] int indexOf(const State& state) const;

  /// Neither database nor journal can be read by others than their owner.
  static void expectPrivate();
  /// No journal that SQLite would still have to play back. One without content
  /// or with a zeroed header has no say and waits for the next change.
  static void expectNoHotJournal();

  static constexpr char kJournal[] = "/var/packages/Corvane/target/etc/oauth.db-journal";

  Operation operation_;
  std::vector<State> states_;  // before, and after each unit
  Answer answer_;

 private:
  std::map<std::string, std::string> files_;  // as furnished, by path
  mode_t umask_ = 0;
};

}  // namespace faults

#endif  // KELDOAUTH_TESTS_FAULTS_SCENE_H
