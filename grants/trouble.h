// What the store could not do: the only exception of this floor, besides those
// of the standard library and of JsonCpp when memory runs out. An operation that ends with it has
// changed nothing, and has looked at nothing that could be relied upon: "not found" is never an
// answer to a question that could not be asked.

#ifndef KELDOAUTH_GRANTS_TROUBLE_H
#define KELDOAUTH_GRANTS_TROUBLE_H

#include <exception>
#include <string>

namespace KELDOAUTHSERVER::grants {

class Trouble : public std::exception {
 public:
  enum class Kind {
    kLocked,    // another process held the file for the whole wait of 5 seconds
    kFull,      // as many rows as the settings allow, and none of them is dead
    kMedium,    // the disk is full, cannot be read or cannot be written
    kNotReady,  // the file could not be opened, or its tables not be made
    kCipher,    // a value could not be encrypted or decrypted
    kMemory,    // out of memory, or no random numbers; the lock may be held until
                // the object's next change or its end
    kOther,     // anything else that SQLite says
  };

  /// `code` and `text` as the store left them: core/oauth_errors.h or SQLite's.
  Trouble(int code, std::string text);

  [[nodiscard]] Kind kind() const noexcept;
  [[nodiscard]] int code() const noexcept { return code_; }
  /// The text of the code, in English; it names no user and no application.
  [[nodiscard]] const char* what() const noexcept override { return text_.c_str(); }

  /// True when the same request can succeed in a moment without anybody's
  /// help: kLocked and kMemory. For the others somebody has to make room or to
  /// look after the box.
  [[nodiscard]] bool canTryAgain() const noexcept;

 private:
  int code_;
  std::string text_;
};

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_TROUBLE_H
