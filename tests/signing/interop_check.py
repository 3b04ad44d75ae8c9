"""Checks and makes signed tokens with cryptography, without a JOSE library.

verify SET TOKENS: every token of the file against the public JWK set.
make SET TOKENS: a key file with two keys of each algorithm, and a token by each.
"""
import base64
import hashlib
import json
import sys

from cryptography.hazmat.primitives import hashes
from cryptography.hazmat.primitives.asymmetric import ec, padding, rsa, utils

SHA256 = hashes.SHA256()


def encode(data):
    return base64.urlsafe_b64encode(data).rstrip(b"=").decode()


def decode(text):
    return base64.urlsafe_b64decode(text + "=" * (-len(text) % 4))


def number(text):
    return int.from_bytes(decode(text), "big")


def text_of(value, size=None):
    return encode(value.to_bytes(size or (value.bit_length() + 7) // 8, "big"))


def thumbprint(jwk):
    names = ("e", "kty", "n") if jwk["kty"] == "RSA" else ("crv", "kty", "x", "y")
    text = json.dumps({name: jwk[name] for name in names}, separators=(",", ":"), sort_keys=True)
    return encode(hashlib.sha256(text.encode()).digest())


def public_key(jwk):
    if jwk["kty"] == "RSA":
        return rsa.RSAPublicNumbers(number(jwk["e"]), number(jwk["n"])).public_key()
    numbers = ec.EllipticCurvePublicNumbers(number(jwk["x"]), number(jwk["y"]), ec.SECP256R1())
    return numbers.public_key()


def verify_token(token, keys):
    head, payload, signature = token.split(".")
    header = json.loads(decode(head))
    jwk = keys[header["kid"]]
    assert header["alg"] == jwk["alg"] and header["typ"] == "JWT", header
    assert "sub" in json.loads(decode(payload))
    signed, raw = f"{head}.{payload}".encode(), decode(signature)
    if jwk["alg"] == "RS256":
        public_key(jwk).verify(raw, signed, padding.PKCS1v15(), SHA256)
    else:
        assert len(raw) == 64
        r, s = (int.from_bytes(half, "big") for half in (raw[:32], raw[32:]))
        public_key(jwk).verify(utils.encode_dss_signature(r, s), signed, ec.ECDSA(SHA256))


def verify(set_path, tokens_path):
    with open(set_path) as file:
        keys = {jwk["kid"]: jwk for jwk in json.load(file)["keys"]}
    for kid, jwk in keys.items():
        assert kid == thumbprint(jwk) and jwk["use"] == "sig", jwk
    with open(tokens_path) as file:
        tokens = file.read().split()
    for token in tokens:
        verify_token(token, keys)
    print(len(tokens), "good")


def make_rsa():
    key = rsa.generate_private_key(65537, 2048)
    own, public = key.private_numbers(), key.public_key().public_numbers()
    jwk = {"kty": "RSA", "alg": "RS256", "n": text_of(public.n), "e": text_of(public.e),
           "d": text_of(own.d), "p": text_of(own.p), "q": text_of(own.q),
           "dp": text_of(own.dmp1), "dq": text_of(own.dmq1), "qi": text_of(own.iqmp)}
    return jwk, lambda data: key.sign(data, padding.PKCS1v15(), SHA256)


def make_ec():
    key = ec.generate_private_key(ec.SECP256R1())
    own, public = key.private_numbers(), key.public_key().public_numbers()
    jwk = {"kty": "EC", "crv": "P-256", "alg": "ES256", "x": text_of(public.x, 32),
           "y": text_of(public.y, 32), "d": text_of(own.private_value, 32)}

    def sign(data):
        r, s = utils.decode_dss_signature(key.sign(data, ec.ECDSA(SHA256)))
        return r.to_bytes(32, "big") + s.to_bytes(32, "big")
    return jwk, sign


def make(set_path, tokens_path):
    keys, tokens = [], []
    for maker in (make_rsa, make_rsa, make_ec, make_ec):
        jwk, sign = maker()
        jwk |= {"use": "sig", "kid": thumbprint(jwk), "made": 0, "signs_from": 0}
        header = json.dumps({"alg": jwk["alg"], "kid": jwk["kid"]}).encode()
        text = encode(header) + "." + encode(b'{"sub": "somebody"}')
        keys.append(jwk)
        tokens.append(text + "." + encode(sign(text.encode())))
    with open(set_path, "w") as file:
        json.dump({"keys": keys}, file)
    with open(tokens_path, "w") as file:
        file.write("\n".join(tokens) + "\n")
    print("made")


{"verify": verify, "make": make}[sys.argv[1]](*sys.argv[2:])
