// SPDX-License-Identifier: Apache-2.0
// Base64 both ways by Node's Buffer, for the same inputs as base64_benchmark. Prints results in the form
// that run.py reads.
const repetitions = Number(process.argv[2] ?? 5);
const sizes = {"1 KB": 1000, "100 KB": 100000, "5 MB": 5000000};

/** Bytes per second of `action`, which handles `bytes` bytes, over about a fifth of a second. */
function speed(bytes, action) {
    const start = performance.now();
    let count = 0;
    let elapsed = 0;
    do {
        for (let i = 0; i < 10; ++i)
            action();
        count += 10;
        elapsed = performance.now() - start;
    } while (elapsed < 200);
    return bytes * count / elapsed * 1000;
}

const benchmarks = [];
for (const [name, bytes] of Object.entries(sizes)) {
    const raw = Buffer.alloc(bytes);
    for (let i = 0; i < bytes; ++i)
        raw[i] = Math.random() * 256;
    const text = raw.toString("base64");
    const encode = () => raw.toString("base64");
    const decode = () => Buffer.from(text, "base64");
    speed(bytes, encode);
    speed(bytes, decode);
    for (let i = 0; i < repetitions; ++i) {
        benchmarks.push({name: `base64 encode/${name}/Node`, bytes_per_second: speed(bytes, encode)});
        benchmarks.push({name: `base64 decode/${name}/Node`, bytes_per_second: speed(bytes, decode)});
    }
}
console.log(JSON.stringify({benchmarks}));
