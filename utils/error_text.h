// The text of an errno value, whichever strerror_r the C library has.

#ifndef KELDOAUTH_UTILS_ERROR_TEXT_H
#define KELDOAUTH_UTILS_ERROR_TEXT_H

namespace KELDOAUTHSERVER {

/// glibc's own strerror_r returns the text, in `buffer` or elsewhere.
inline const char* errorText(const char* text, const char* /*buffer*/) {
  return text;
}

/// The standard's, which musl has, returns a status. The text is in `buffer`,
/// cut when it does not fit; an unknown number may leave none there.
inline const char* errorText(int /*status*/, const char* buffer) {
  return buffer[0] != '\0' ? buffer : "Unknown error";
}

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_UTILS_ERROR_TEXT_H
