// Names for the rows of a table of cases whose type has a `name`.

#ifndef KELDOAUTH_TESTS_SUPPORT_CASE_NAME_H
#define KELDOAUTH_TESTS_SUPPORT_CASE_NAME_H

#include <gtest/gtest.h>

#include <string>

namespace support {

/// The last argument of INSTANTIATE_TEST_SUITE_P.
struct CaseName {
  template <typename Row>
  std::string operator()(const ::testing::TestParamInfo<Row>& row) const {
    return row.param.name;
  }
};

}  // namespace support

#endif  // KELDOAUTH_TESTS_SUPPORT_CASE_NAME_H
