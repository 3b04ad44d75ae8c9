// The examples of the standards; their keys lie in vectors/.

#ifndef KELDOAUTH_TESTS_SIGNING_VECTORS_H
#define KELDOAUTH_TESTS_SIGNING_VECTORS_H

namespace vectors {

/// RFC 7515 A.2 and A.3: what two keys signed.
inline constexpr char kRsaSigned[] =
    "eyJhbGciOiJSUzI1NiJ9.eyJpc3MiOiJqb2UiLA0KICJleHAiOjEzMDA4MTkzODAsDQogImh0dHA6Ly9leGFtcGxlLmNvb"
    "S9pc19yb290Ijp0cnVlfQ";
inline constexpr char kRsaSignature[] =
    "cC4hiUPoj9Eetdgtv3hF80EGrhuB__dzERat0XF9g2VtQgr9PJbu3XOiZj5RZmh7AAuHIm4Bh-0Qc_lF5YKt_O8W2Fp5ju"
    "jGbds9uJdbF9CUAr7t1dnZcAcQjbKBYNX4BAynRFdiuB--f_nZLgrnbyTyWzO75vRK5h6xBArLIARNPvkSjtQBMHlb1L07"
    "Qe7K0GarZRmB_eSN9383LcOLn6_dO--xi12jzDwusC-eOkHWEsqtFZESc6BfI7noOPqvhJ1phCnvWh6IeYI2w9QOYEUipU"
    "TI8np6LbgGY9Fs98rqVt5AXLIhWkWywlVmtVrBp0igcN_IoypGlUPQGe77Rw";

inline constexpr char kEcSigned[] =
    "eyJhbGciOiJFUzI1NiJ9.eyJpc3MiOiJqb2UiLA0KICJleHAiOjEzMDA4MTkzODAsDQogImh0dHA6Ly9leGFtcGxlLmNvb"
    "S9pc19yb290Ijp0cnVlfQ";
inline constexpr char kEcSignature[] =
    "DtEhU3ljbEg8L38VWAfUAqOyKAM6-Xx-F4GawxaepmXFCgfTjDxw5djxLa8ISlSApmWQxfKTUJqPP3-Kg6NU1Q";

/// RFC 7638 3.1: the thumbprint of the RSA key of RFC 7517 A.2.
inline constexpr char kRsaThumbprint[] = "NzbLsXh8uDCcd-6MNwXF4W_7noWXFZAfHkxZsRGC9Xs";

/// OpenID Connect Core 1.0 A.3: an access token and its at_hash.
inline constexpr char kAccessToken[] = "jHkWEdUXMU1BwAsC4vtUsZwnNvTIxEl0z9K3vx5KF0Y";
inline constexpr char kAtHash[] = "77QmUPtjPfzWtF2AnpK9RQ";

}  // namespace vectors

#endif  // KELDOAUTH_TESTS_SIGNING_VECTORS_H
