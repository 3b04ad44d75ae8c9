// ECDSA over P-256.

#include <nettle/dsa.h>
#include <nettle/ecc-curve.h>
#include <nettle/ecc.h>
#include <nettle/ecdsa.h>

#include "service/signing/key_fault.h"
#include "service/signing/key_pair.h"
#include "service/signing/number.h"
#include "service/signing/random.h"
#include "service/text/encoding.h"

namespace keldoauth::service::signing {
namespace {

constexpr std::size_t kSize = 32;  // bytes of a number of the curve

class Point {
 public:
  Point() { ecc_point_init(&value_, nettle_get_secp_256r1()); }
  ~Point() { ecc_point_clear(&value_); }
  Point(const Point&) = delete;
  Point& operator=(const Point&) = delete;

  [[nodiscard]] ecc_point* get() { return &value_; }
  [[nodiscard]] const ecc_point* get() const { return &value_; }

 private:
  ecc_point value_{};
};

class Signature {
 public:
  Signature() { dsa_signature_init(&value_); }
  ~Signature() { dsa_signature_clear(&value_); }
  Signature(const Signature&) = delete;
  Signature& operator=(const Signature&) = delete;

  [[nodiscard]] dsa_signature* get() { return &value_; }

 private:
  dsa_signature value_{};
};

class EcPair : public KeyPair {
 public:
  EcPair() { ecc_scalar_init(&secret_, nettle_get_secp_256r1()); }
  ~EcPair() override { ecc_scalar_clear(&secret_); }
  EcPair(const EcPair&) = delete;
  EcPair& operator=(const EcPair&) = delete;

  void make() {
    Random random;
    ecdsa_generate_keypair(point_.get(), &secret_, &random, Random::fill);
  }

  void read(const Json::Value& jwk) {
    if (textMember(jwk, "kty") != "EC") throw KeyFault("kty is not EC");
    if (textMember(jwk, "crv") != "P-256") throw KeyFault("crv is not P-256");
    Number x;
    Number y;
    Number d;
    readMember(jwk, "x", x);
    readMember(jwk, "y", y);
    readMember(jwk, "d", d);
    if (ecc_point_set(point_.get(), x.get(), y.get()) == 0) {
      throw KeyFault("x and y are no point of the curve");
    }
    if (ecc_scalar_set(&secret_, d.get()) == 0) throw KeyFault("d is no number of the curve");
    checkPoint(x, y);
  }

  [[nodiscard]] Algorithm algorithm() const override { return Algorithm::kEs256; }

  [[nodiscard]] Json::Value publicMembers() const override {
    Number x;
    Number y;
    ecc_point_get(point_.get(), x.get(), y.get());
    Json::Value jwk(Json::objectValue);
    jwk["kty"] = "EC";
    jwk["crv"] = "P-256";
    jwk["x"] = base64Url(bytesOfNumber(x.get(), kSize));
    jwk["y"] = base64Url(bytesOfNumber(y.get(), kSize));
    return jwk;
  }

  void addPrivateMembers(Json::Value& jwk) const override {
    Number d;
    ecc_scalar_get(&secret_, d.get());
    jwk["d"] = base64Url(bytesOfNumber(d.get(), kSize));
  }

  [[nodiscard]] std::string sign(const Digest& digest) const override {
    Random random;
    Signature signature;
    ecdsa_sign(&secret_, &random, Random::fill, digest.size(), digest.data(), signature.get());
    return bytesOfNumber(signature.get()->r, kSize) + bytesOfNumber(signature.get()->s, kSize);
  }

  [[nodiscard]] bool hasSigned(const Digest& digest, std::string_view bytes) const override {
    if (bytes.size() != 2 * kSize) return false;
    Signature signature;
    setToBytes(signature.get()->r, bytes.substr(0, kSize));
    setToBytes(signature.get()->s, bytes.substr(kSize));
    return ecdsa_verify(point_.get(), digest.size(), digest.data(), signature.get()) != 0;
  }

 private:
  /// At full length, zeros in front included (RFC 7518 6.2).
  static void readMember(const Json::Value& jwk, const char* name, Number& number) {
    const std::string bytes = bytesMember(jwk, name, kSize);
    if (bytes.size() != kSize) throw KeyFault(std::string(name) + " has a bad length");
    setToBytes(number.get(), bytes);
  }

  void checkPoint(const Number& x, const Number& y) const {
    Point point;
    ecc_point_mul_g(point.get(), &secret_);
    Number realX;
    Number realY;
    ecc_point_get(point.get(), realX.get(), realY.get());
    if (mpz_cmp(realX.get(), x.get()) != 0 || mpz_cmp(realY.get(), y.get()) != 0) {
      throw KeyFault("x and y do not fit d");
    }
  }

  Point point_;
  ecc_scalar secret_{};
};

}  // namespace

std::shared_ptr<const KeyPair> makeEcPair() {
  auto pair = std::make_shared<EcPair>();
  pair->make();
  return pair;
}

std::shared_ptr<const KeyPair> readEcPair(const Json::Value& jwk) {
  auto pair = std::make_shared<EcPair>();
  pair->read(jwk);
  return pair;
}

}  // namespace keldoauth::service::signing
