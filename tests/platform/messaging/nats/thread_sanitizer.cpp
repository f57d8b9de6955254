// SPDX-License-Identifier: Apache-2.0
// What the thread sanitizer must not report in the tests that this file is linked into.
//
// libnats 3.4 reads from a TLS connection on one thread while it writes on another, without a lock
// between them. The sanitizer sees OpenSSL touch the same memory from both when a server breaks a
// connection off with an alert, and the connection is given up then.

// Visible, or the sanitizer's library would not find it in the program.
extern "C" [[gnu::visibility("default")]] const char* __tsan_default_suppressions();

extern "C" const char* __tsan_default_suppressions() {
    return "race:libssl.so\nrace:libcrypto.so\n";
}
