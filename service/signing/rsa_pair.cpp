// RSA with PKCS #1 1.5. 2,048 bits, the least that RFC 7518 3.3 allows: 3,072
// take two and a half to three times as long for a signature, a tenth of a second
// and more on a small ARM, and these keys are replaced long before they wear out.

#include <nettle/rsa.h>

#include "service/signing/key_fault.h"
#include "service/signing/key_pair.h"
#include "service/signing/number.h"
#include "service/signing/random.h"

namespace keldoauth::service::signing {
namespace {

constexpr unsigned kBits = 2048;
constexpr std::size_t kMaxBits = 4096;  // a key from elsewhere
constexpr unsigned long kExponent = 65537;

class RsaPair : public KeyPair {
 public:
  RsaPair() {
    rsa_public_key_init(&public_);
    rsa_private_key_init(&private_);
  }
  ~RsaPair() override {
    rsa_private_key_clear(&private_);
    rsa_public_key_clear(&public_);
  }
  RsaPair(const RsaPair&) = delete;
  RsaPair& operator=(const RsaPair&) = delete;

  void make() {
    Random random;
    mpz_set_ui(public_.e, kExponent);
    if (rsa_generate_keypair(&public_, &private_, &random, Random::fill, nullptr, nullptr, kBits,
                             0) == 0) {
      throw KeyFault("no RSA key could be made");
    }
  }

  void read(const Json::Value& jwk) {
    if (textMember(jwk, "kty") != "RSA") throw KeyFault("kty is not RSA");
    readMember(jwk, "n", public_.n);
    readMember(jwk, "e", public_.e);
    readMember(jwk, "d", private_.d);
    readMember(jwk, "p", private_.p);
    readMember(jwk, "q", private_.q);
    readMember(jwk, "dp", private_.a);
    readMember(jwk, "dq", private_.b);
    readMember(jwk, "qi", private_.c);
    check();
    if (rsa_public_key_prepare(&public_) == 0) throw KeyFault("n is too short");
    if (rsa_private_key_prepare(&private_) == 0) throw KeyFault("p and q are too short");
  }

  [[nodiscard]] Algorithm algorithm() const override { return Algorithm::kRs256; }

  [[nodiscard]] Json::Value publicMembers() const override {
    Json::Value jwk(Json::objectValue);
    jwk["kty"] = "RSA";
    jwk["n"] = textOfNumber(public_.n);
    jwk["e"] = textOfNumber(public_.e);
    return jwk;
  }

  void addPrivateMembers(Json::Value& jwk) const override {
    jwk["d"] = textOfNumber(private_.d);
    jwk["p"] = textOfNumber(private_.p);
    jwk["q"] = textOfNumber(private_.q);
    jwk["dp"] = textOfNumber(private_.a);
    jwk["dq"] = textOfNumber(private_.b);
    jwk["qi"] = textOfNumber(private_.c);
  }

  /// Blinded, in steps that do not tell the key, and checked before it is given
  /// out: one wrong signature by a failing machine would tell p.
  [[nodiscard]] std::string sign(const Digest& digest) const override {
    Random random;
    Number signature;
    if (rsa_sha256_sign_digest_tr(&public_, &private_, &random, Random::fill, digest.data(),
                                  signature.get()) == 0) {
      throw KeyFault("the RSA key does not sign");
    }
    return bytesOfNumber(signature.get(), public_.size);
  }

  [[nodiscard]] bool hasSigned(const Digest& digest, std::string_view signature) const override {
    if (signature.size() != public_.size) return false;
    Number number;
    setToBytes(number.get(), signature);
    return rsa_sha256_verify_digest(&public_, digest.data(), number.get()) != 0;
  }

 private:
  static void readMember(const Json::Value& jwk, const char* name, mpz_ptr number) {
    const std::string bytes = bytesMember(jwk, name, kMaxBits / 8);
    if (bytes.front() == '\0') throw KeyFault(std::string(name) + " has a zero in front");
    setToBytes(number, bytes);
  }

  void check() const {
    if (bitsOf(public_.n) < kBits) throw KeyFault("n is too short");
    if (bitsOf(private_.p) != bitsOf(private_.q)) throw KeyFault("p and q differ in length");
    if (mpz_even_p(private_.p) != 0 || mpz_even_p(private_.q) != 0) {
      throw KeyFault("p and q are no primes");
    }
    Number product;
    mpz_mul(product.get(), private_.p, private_.q);
    if (mpz_cmp(product.get(), public_.n) != 0 || mpz_cmp(private_.p, private_.q) == 0) {
      throw KeyFault("n is not p times q");
    }
    if (mpz_cmp_ui(public_.e, kExponent) != 0) throw KeyFault("e is not 65537");
    if (mpz_cmp(private_.d, public_.n) >= 0) throw KeyFault("d is too large");
    checkExponent("dp", private_.a, private_.p);
    checkExponent("dq", private_.b, private_.q);
    mpz_mul(product.get(), private_.c, private_.q);
    mpz_mod(product.get(), product.get(), private_.p);
    const bool isInverse = mpz_cmp_ui(product.get(), 1) == 0;
    if (!isInverse || mpz_cmp(private_.c, private_.p) >= 0) throw KeyFault("qi does not fit");
  }

  /// `exponent` is d modulo `prime` - 1, and undoes e.
  void checkExponent(const char* name, mpz_srcptr exponent, mpz_srcptr prime) const {
    Number order;
    Number number;
    mpz_sub_ui(order.get(), prime, 1);
    mpz_mod(number.get(), private_.d, order.get());
    if (mpz_cmp(number.get(), exponent) != 0) throw KeyFault(std::string(name) + " does not fit");
    mpz_mul(number.get(), number.get(), public_.e);
    mpz_mod(number.get(), number.get(), order.get());
    if (mpz_cmp_ui(number.get(), 1) != 0) throw KeyFault("d does not fit");
  }

  rsa_public_key public_{};
  rsa_private_key private_{};
};

}  // namespace

std::shared_ptr<const KeyPair> makeRsaPair() {
  auto pair = std::make_shared<RsaPair>();
  pair->make();
  return pair;
}

std::shared_ptr<const KeyPair> readRsaPair(const Json::Value& jwk) {
  auto pair = std::make_shared<RsaPair>();
  pair->read(jwk);
  return pair;
}

}  // namespace keldoauth::service::signing
