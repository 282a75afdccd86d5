#!/usr/bin/env python3
# SPDX-License-Identifier: BSD-2-Clause
"""tsm.py URL DEVICE.json CA-TSM.pem: a TSM, written from protocol.md alone, that takes the device at
URL through all eight messages, with its device file and the private key that admits TSMs."""
import base64, hashlib, hmac, json, os, struct, sys, urllib.request
from cryptography.hazmat.primitives import hashes, padding, serialization
from cryptography.hazmat.primitives.asymmetric import padding as rsa_padding, rsa
from cryptography.hazmat.primitives.ciphers import Cipher, aead, algorithms, modes

PKCS1 = rsa_padding.PKCS1v15()

def b64url(data):
    return base64.urlsafe_b64encode(data).decode().rstrip("=")

def unb64url(text):
    return base64.urlsafe_b64decode(text + "=" * (-len(text) % 4))

def compact(value):
    return json.dumps(value, separators=(",", ":"), ensure_ascii=False).encode()

def encode_key(key):
    numbers = key.public_numbers().n, key.public_numbers().e
    blocks = [number.to_bytes((number.bit_length() + 7) // 8, "big") for number in numbers]
    return b"".join(struct.pack("<I", len(block)) + block for block in blocks)

def decode_key(data):
    n_len = struct.unpack_from("<I", data)[0]
    n, e = int.from_bytes(data[4:4 + n_len], "big"), int.from_bytes(data[8 + n_len:], "big")
    return rsa.RSAPublicNumbers(e, n).public_key()

def sign(key, data):
    return b64url(key.sign(data, PKCS1, hashes.SHA256()))

def encrypt_cbc(key, iv, plain):
    padder, cipher = padding.PKCS7(128).padder(), Cipher(algorithms.AES(key), modes.CBC(iv))
    encryptor = cipher.encryptor()
    return encryptor.update(padder.update(plain) + padder.finalize()) + encryptor.finalize()

def cbc_tag(cek, aad, iv, ciphertext):
    covered = aad + iv + ciphertext + struct.pack(">Q", 8 * len(aad))
    return hmac.digest(cek[:16], covered, "sha256")[:16]

def seal(key, plain, gcm):
    protect = b64url(compact({"alg": "dir", "enc": "A128GCM" if gcm else "A128CBC-HS256"}))
    aad, cek, iv = protect.encode(), os.urandom(16 if gcm else 32), os.urandom(12 if gcm else 16)
    if gcm:
        sealed = aead.AESGCM(cek).encrypt(iv, plain, aad)  # with the tag behind it
    else:
        sealed = encrypt_cbc(cek[16:], iv, plain)
        sealed += cbc_tag(cek, aad, iv, sealed)
    recipient = {"header": {"alg": "RSA1_5"}, "encrypted_key": b64url(key.encrypt(cek, PKCS1))}
    return {"protect": protect, "recipients": [recipient], "iv": b64url(iv),
            "ciphertext": b64url(sealed[:-16]), "tag": b64url(sealed[-16:])}

def unseal(key, jwe):
    cek = key.decrypt(unb64url(jwe["recipients"][0]["encrypted_key"]), PKCS1)
    iv, ciphertext = unb64url(jwe["iv"]), unb64url(jwe["ciphertext"])
    assert cbc_tag(cek, jwe["protect"].encode(), iv, ciphertext) == unb64url(jwe["tag"])
    decryptor = Cipher(algorithms.AES(cek[16:]), modes.CBC(iv)).decryptor()
    unpadder = padding.PKCS7(128).unpadder()
    return json.loads(unpadder.update(decryptor.update(ciphertext)) + unpadder.finalize())

class Tsm:
    def __init__(self, url, device, ca, tsmid="stranger"):
        self.url, self.device_id, self.ca, self.tsmid = url, device["device_id"], ca, tsmid
        self.tee_key = decode_key(unb64url(device["tee_public_key"]))
        self.key, self.document = rsa.generate_private_key(65537, 2048), None

    def http(self, path, body=None, headers={"Content-Type": "application/otrp+json"}):
        return urllib.request.urlopen(urllib.request.Request(self.url + path, body, headers))

    def post(self, path, message, verified_with):
        with self.http("/otrp/" + path, compact(message)) as answer:
            image_path, (envelope,) = answer.headers["OTrP-TA-Image"], json.load(answer).values()
        self.image = self.http(image_path).read() if image_path else None
        signed = (envelope["protect"] + "." + envelope["payload"]).encode()
        verified_with.verify(unb64url(envelope["signature"]), signed, PKCS1, hashes.SHA256())
        return json.loads(unb64url(envelope["payload"]))

    def request(self, path, kind, content=None, taid=None, gcm=False, **members):
        tbs = {"ver": "1.0", "rid": os.urandom(8).hex(), "tid": os.urandom(8).hex(), **members}
        if content:
            tbs |= {"dsihash": self.dsihash(), "content": seal(self.tee_key, compact(content), gcm)}
        protect, payload = b64url(b'{"alg":"RS256"}'), b64url(compact({kind + "TBSRequest": tbs}))
        envelope = {"payload": payload, "protect": protect, "header": {"tsmid": self.tsmid},
                    "signature": sign(self.key, f"{protect}.{payload}".encode())}
        if taid:
            approved = (tbs["tid"], tbs["rid"], self.device_id, taid, self.tsmid)
            envelope["signature2"] = sign(self.ca, "".join(approved).encode())
        answer = self.post(path, {kind + "Request": envelope}, self.tee_key)
        answer = answer.get(kind + "TBSResponse", answer)
        if answer.get("status") == "fail":
            raise RuntimeError(f"{kind} refused: 0x{answer['reason']['error_code']:08x}")
        assert (answer["rid"], answer["tid"]) == (tbs["rid"], tbs["tid"])
        content = unseal(self.key, answer["content" if content else "edsi"])
        self.document = {"dsi": content["dsi"]}
        return content

    def dsihash(self):
        self.hashed = base64.b64encode(compact(self.document).replace(b"/", b"\\/"))
        return hashlib.sha256(self.hashed).hexdigest()

    def aik(self, spid):
        listed = self.document["dsi"]["tee"]["teeaiklist"]
        return decode_key(unb64url({entry["spid"]: entry["spaik"] for entry in listed}[spid]))

    def get_device_state(self):
        key, ca = encode_key(self.key.public_key()), encode_key(self.ca.public_key())
        block = struct.pack("<IHHHH", 0x70004830, 3, 256, len(self.tsmid), 256)
        entry = {"tsmid": self.tsmid, "tsm_pub_key": b64url(key),
                 "signature": sign(self.ca, block + self.tsmid.encode() + key)}
        self.request("get-device-state", "GetDeviceState", tsm_key_chain={
            "ca_tsm_hash": hashlib.sha256(b64url(ca).encode()).hexdigest(), "tsm_list": [entry]})

    def bring_ta(self, path, kind, image, **content):
        key, iv, aik = os.urandom(32), os.urandom(16), self.aik(content["spid"])
        self.request(path, kind, content, content["taid"], encrypted_ta={
            "key": b64url(aik.encrypt(key, PKCS1)), "iv": b64url(iv),
            "ciphertadata" if kind == "InstallTA" else "ciphernewtadata":
                b64url(encrypt_cbc(key[16:], iv, image))})

    def get_ta_info(self, spid, taid):
        request = {"GetTAInfoRequest": {"spid": spid, "taid": taid}}
        return self.post("get-ta-info", request, self.aik(spid))["TAInformationTBS"]

def image_of(program):
    return struct.pack("<16sHH", b"my TA", 32, 0) + hashlib.sha256(program).digest() + program

def main(url, device_file, ca_file):
    with open(device_file) as device, open(ca_file, "rb") as ca:
        tsm = Tsm(url, json.load(device), serialization.load_pem_private_key(ca.read(), None))
    sp, sd, mine = {"spid": "bank"}, {"sdname": "cards/>>>>>?????"}, {"tsmid": tsm.tsmid}
    taid = {"taid": os.urandom(16).hex()}
    tsm.get_device_state()
    print("before", tsm.dsihash())
    tsm.request("create-sd", "CreateSD", {**sp, **sd, **mine, "spcert": "a certificate"})
    for path, kind, version in ("install-ta", "InstallTA", "1.0"), ("update-ta", "UpdateTA", "1.1"):
        image = image_of(version.encode() * 5000)
        tsm.bring_ta(path, kind, image, **sp, **sd, **taid, ta_version=version)
        assert tsm.image == image and {*b"+/"} < {*tsm.hashed}  # base64url would have failed
    print("TA    ", tsm.get_ta_info("bank", taid["taid"])["ta_version"])
    old_aik, changes = tsm.aik("bank"), {"renewteespaik": "true", "spcert": "another certificate"}
    tsm.request("update-sd", "UpdateSD", {**sp, **sd, **mine, "changes": changes}, gcm=True)
    assert encode_key(tsm.aik("bank")) != encode_key(old_aik)
    tsm.request("delete-ta", "DeleteTA", {**sd, **taid, **mine})
    tsm.request("delete-sd", "DeleteSD", {**sd, **mine, "deleteta": "true"})
    print("after ", tsm.dsihash())

if __name__ == "__main__":
    main(*sys.argv[1:])
