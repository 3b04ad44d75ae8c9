# The language of every target: C++17, or what the caller asks for beyond it.
if(NOT CMAKE_CXX_STANDARD MATCHES "^(17|2.)$")
  set(CMAKE_CXX_STANDARD 17)
endif()
set(CMAKE_CXX_STANDARD_REQUIRED ON)
if(NOT DEFINED CMAKE_CXX_EXTENSIONS)
  set(CMAKE_CXX_EXTENSIONS OFF)
endif()

# What flags of the caller's may have taken away is said here, not by each source.
include(CheckCXXSourceCompiles)
check_cxx_source_compiles("
  #include <charconv>
  #include <optional>
  #include <stdexcept>
  #include <string_view>
  int main() {
    try {
      const std::string_view text = \"17\";
      std::optional<int> number = 0;
      std::from_chars(text.data(), text.data() + text.size(), *number);
      throw std::out_of_range(std::to_string(*number));
    } catch (const std::exception&) {
      return 0;
    }
  }" KELDOAUTH_LANGUAGE_IS_THERE)
if(NOT KELDOAUTH_LANGUAGE_IS_THERE)
  unset(KELDOAUTH_LANGUAGE_IS_THERE CACHE)
  message(FATAL_ERROR "keldoauth: ${CMAKE_CXX_COMPILER} with the flags \"${CMAKE_CXX_FLAGS}\" "
    "compiles and links no program with C++17's library and exceptions; it takes both")
endif()
