// SPDX-License-Identifier: Apache-2.0
// Loads a source file of the page under Node.js.
import { createRequire } from "node:module";
import { join } from "node:path";
import { fileURLToPath } from "node:url";

const WEB = fileURLToPath(new URL("../../web/", import.meta.url));
const { build } = createRequire(join(WEB, "package.json"))("esbuild");

/** What web/src/`file` exports, with all that it imports. */
export async function room(file) {
  const { outputFiles } = await build({
    entryPoints: [join(WEB, "src", file)],
    bundle: true,
    format: "esm",
    write: false,
    target: "es2022",
    loader: { ".css": "empty", ".bin": "binary" },
  });
  const code = Buffer.from(outputFiles[0].contents).toString("base64");
  return import(`data:text/javascript;base64,${code}`);
}
