// A medium on which one kind of call fails.

#ifndef KELDOAUTH_TESTS_FAULTS_FAILING_DISK_H
#define KELDOAUTH_TESTS_FAULTS_FAILING_DISK_H

#include "tests/faults/faulty_vfs.h"
#include "tests/faults/trials.h"

namespace faults {

class FailingDisk : public Medium, public Fault {
 public:
  /// Calls of this kind fail with SQLite's `error`.
  FailingDisk(Call call, int error) : call_(call), error_(error) {}

  void arm(int nth, bool lasting) override {
    callsLeft_ = nth;
    lasting_ = lasting;
    struck_ = false;
  }
  void disarm() override { callsLeft_ = 0; }
  [[nodiscard]] bool struck() const override { return struck_; }

  /// The primary code: the library never asks SQLite for extended ones.
  [[nodiscard]] int code() const override { return error_ & 0xFF; }

  int permit(Call call) override {
    if (call != call_ || callsLeft_ == 0) return SQLITE_OK;
    if (callsLeft_ > 1) {
      --callsLeft_;
      return SQLITE_OK;
    }
    struck_ = true;
    if (!lasting_) callsLeft_ = 0;
    return error_;
  }

 private:
  Call call_;
  int error_;
  int callsLeft_ = 0;  // until the failing one; 0: none fails
  bool lasting_ = false;
  bool struck_ = false;
};

}  // namespace faults

#endif  // KELDOAUTH_TESTS_FAULTS_FAILING_DISK_H
