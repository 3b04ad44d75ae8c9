// What becomes of an exception at the end of an operation.

#ifndef KELDOAUTH_CORE_UNEXPECTED_H
#define KELDOAUTH_CORE_UNEXPECTED_H

namespace KELDOAUTHSERVER {

/// The line "Unexpected failure[<what>]".
void logUnexpected(const char* source, int number, const char* what);

/// To be called in a catch block that ends a static operation, which has no
/// object to keep an error: writes that line and returns 0.
int failWithoutObject(int number) noexcept;

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_CORE_UNEXPECTED_H
