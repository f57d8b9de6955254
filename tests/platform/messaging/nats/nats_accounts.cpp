// SPDX-License-Identifier: Apache-2.0
// A key is an Ed25519 key, written in base32 as its kind, its 32 bytes and their CRC-16. A text is
// a JWT that such a key signs.
#include "tests/platform/messaging/nats/nats_accounts.h"

#include <openssl/evp.h>

#include <array>
#include <cstdint>
#include <memory>
#include <stdexcept>
#include <string_view>

namespace platform::messaging {
namespace {

enum class Kind : std::uint8_t { account = 0 << 3, operatorKind = 14 << 3, user = 20 << 3 };
constexpr std::uint8_t seedPrefix = 18 << 3;

// Writes `bytes` in groups of `bits` bits by the digits of `alphabet`, without padding.
std::string encode(std::string_view bytes, int bits, std::string_view alphabet) {
    std::string text;
    unsigned gathered = 0;
    int count = 0;
    const auto digit = [&](unsigned value) {
        return alphabet[value & ((1U << static_cast<unsigned>(bits)) - 1)];
    };
    for (const char c : bytes) {
        gathered = (gathered << 8U | static_cast<unsigned char>(c)) & 0xFFFFU;
        for (count += 8; count >= bits; count -= bits) {
            text += digit(gathered >> static_cast<unsigned>(count - bits));
        }
    }
    if (count > 0) {
        text += digit(gathered << static_cast<unsigned>(bits - count));
    }
    return text;
}

std::string base32(std::string_view bytes) {
    return encode(bytes, 5, "ABCDEFGHIJKLMNOPQRSTUVWXYZ234567");
}

std::string base64url(std::string_view bytes) {
    return encode(bytes, 6, "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_");
}

std::string withChecksum(std::string bytes) {
    unsigned crc = 0;
    for (const char c : bytes) {
        crc ^= static_cast<unsigned>(static_cast<unsigned char>(c)) << 8U;
        for (int bit = 0; bit < 8; ++bit) {
            crc = ((crc << 1U) ^ ((crc & 0x8000U) != 0 ? 0x1021U : 0U)) & 0xFFFFU;
        }
    }
    bytes += static_cast<char>(crc & 0xFFU);
    bytes += static_cast<char>(crc >> 8U);
    return bytes;
}

class Key {
public:
    explicit Key(Kind kind)
        : kind_(static_cast<std::uint8_t>(kind)),
          key_(EVP_PKEY_Q_keygen(nullptr, nullptr, "ED25519"), EVP_PKEY_free) {}

    std::string name() const {
        return base32(withChecksum(static_cast<char>(kind_) + raw(EVP_PKEY_get_raw_public_key)));
    }

    std::string seed() const {
        const std::string prefix = {static_cast<char>(seedPrefix | kind_ >> 5U),
                                    static_cast<char>((kind_ & 31U) << 3U)};
        return base32(withChecksum(prefix + raw(EVP_PKEY_get_raw_private_key)));
    }

    /// A JWT in which this key's owner says who `subject` is.
    std::string certify(const Key& subject, const std::string& properties) const {
        const std::string claims = R"({"jti":"1","iat":1700000000,"iss":")" + name() +
                                   R"(","name":"test","sub":")" + subject.name() +
                                   R"(","nats":{"version":2,)" + properties + "}}";
        const std::string text =
            base64url(R"({"typ":"JWT","alg":"ed25519-nkey"})") + "." + base64url(claims);
        return text + "." + base64url(sign(text));
    }

private:
    template <typename Get>
    std::string raw(Get get) const {
        std::array<unsigned char, 32> bytes{};
        std::size_t size = bytes.size();
        if (get(key_.get(), bytes.data(), &size) != 1) {
            throw std::runtime_error("no key");
        }
        return {bytes.begin(), bytes.end()};
    }

    std::string sign(const std::string& text) const {
        const std::unique_ptr<EVP_MD_CTX, decltype(&EVP_MD_CTX_free)> context(EVP_MD_CTX_new(),
                                                                              EVP_MD_CTX_free);
        std::array<unsigned char, 64> signature{};
        std::size_t size = signature.size();
        if (EVP_DigestSignInit(context.get(), nullptr, nullptr, nullptr, key_.get()) != 1 ||
            EVP_DigestSign(context.get(), signature.data(), &size,
                           reinterpret_cast<const unsigned char*>(text.data()), text.size()) != 1) {
            throw std::runtime_error("no signature");
        }
        return {signature.begin(), signature.end()};
    }

    std::uint8_t kind_;
    std::unique_ptr<EVP_PKEY, decltype(&EVP_PKEY_free)> key_;
};

}  // namespace

NatsAccounts makeNatsAccounts() {
    const Key owner(Kind::operatorKind);
    const Key account(Kind::account);
    const Key user(Kind::user);
    const std::string ofOwner = owner.certify(owner, R"("type":"operator")");
    const std::string ofAccount = owner.certify(
        account,
        R"("type":"account","limits":{"subs":-1,"data":-1,"payload":-1,"imports":-1,"exports":-1,)"
        R"("wildcards":true,"conn":-1,"leaf":-1})");
    const std::string ofUser = account.certify(
        user, R"("type":"user","pub":{},"sub":{},"subs":-1,"data":-1,"payload":-1)");
    return {"operator: \"" + ofOwner + "\"\nresolver: MEMORY\nresolver_preload: { " +
                account.name() + ": \"" + ofAccount + "\" }\n",
            "-----BEGIN NATS USER JWT-----\n" + ofUser +
                "\n------END NATS USER JWT------\n\n-----BEGIN USER NKEY SEED-----\n" +
                user.seed() + "\n------END USER NKEY SEED------\n"};
}

}  // namespace platform::messaging
