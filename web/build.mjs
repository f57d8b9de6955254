// SPDX-License-Identifier: Apache-2.0
// Builds the page into dist/: one script that opens it, chunks that are loaded when they are needed, one
// style sheet, the tables of charsets, and the licences of what they contain.
import { build } from "esbuild";
import { copyFile, cp, mkdir, readFile, readdir, rm, writeFile } from "node:fs/promises";
import { fileURLToPath } from "node:url";

process.chdir(fileURLToPath(new URL(".", import.meta.url)));

// The folder that make_charset_tables has filled, which is built with the host.
const tables = process.env.CHARSET_TABLES ?? "../build/release/web/charset_tables";

await rm("dist", { recursive: true, force: true });
await mkdir("dist");
const { metafile } = await build({
  entryPoints: { main: "src/main.ts" },
  outdir: "dist",
  chunkNames: "chunks/[name]-[hash]",
  assetNames: "assets/[name]-[hash]",
  bundle: true,
  splitting: true,
  format: "esm",
  target: "es2022",
  minify: true,
  sourcemap: true,
  metafile: true,
  legalComments: "none", // LICENSES.txt has them
  alias: { jszip: "./src/package/parts_archive.ts" }, // for docx-preview, which has nothing to unzip here
  loader: { ".bin": "file", ".svg": "file" },
  logLevel: "warning",
});
await cp(tables, "dist/charsets", { recursive: true });
await writeFile("dist/LICENSES.txt", await licenses(Object.keys(metafile.inputs)));
await copyFile("icon.svg", "dist/icon.svg");
await copyFile("index.html", "dist/index.html"); // last: what is newer than it has not been built

// The licences of the npm packages that `inputs` come from.
async function licenses(inputs) {
  const folders = inputs.map((path) => path.match(/^(.*node_modules\/(?:@[^/]+\/)?[^/]+)\//)?.[1]);
  const texts = [];
  for (const folder of [...new Set(folders)].filter(Boolean).sort()) {
    const { name, version, license } = JSON.parse(await readFile(`${folder}/package.json`, "utf8"));
    const file = (await readdir(folder)).find((one) => /^licen[cs]e/i.test(one));
    const text = file ? await readFile(`${folder}/${file}`, "utf8") : `Licence: ${license}\n`;
    texts.push(`${name} ${version}\n\n${text}`);
  }
  return texts.join(`\n${"-".repeat(72)}\n\n`);
}
