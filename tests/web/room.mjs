// SPDX-License-Identifier: Apache-2.0
// Loads source files of the page under Node.js.
import { mkdtempSync, rmSync, writeFileSync } from "node:fs";
import { createRequire } from "node:module";
import { tmpdir } from "node:os";
import { join } from "node:path";
import { fileURLToPath } from "node:url";

const WEB = fileURLToPath(new URL("../../web/", import.meta.url));
const { build } = createRequire(join(WEB, "package.json"))("esbuild");

/**
 * What files of web/src/ export, and npm packages, named as "npm:name", with all that they import. What several
 * of them import they share.
 */
export async function room(...files) {
  const sources = files.map((file) => (file.startsWith("npm:") ? file.slice(4) : `./${file}`));
  const { outputFiles } = await build({
    stdin: {
      contents: sources.map((source) => `export * from ${JSON.stringify(source)};`).join("\n"),
      resolveDir: join(WEB, "src"),
    },
    bundle: true,
    format: "esm",
    write: false,
    target: "es2022",
    loader: { ".css": "empty", ".bin": "binary" },
    nodePaths: [join(WEB, "node_modules")],
  });
  // From a file, since an exception out of a data URL repeats all of it.
  const folder = mkdtempSync(join(tmpdir(), "room-"));
  try {
    writeFileSync(join(folder, "room.mjs"), outputFiles[0].contents);
    return await import(join(folder, "room.mjs"));
  } finally {
    rmSync(folder, { recursive: true });
  }
}
