// join.js OUT ENGINE.JS ENGINE.WASM TAVO.HTML PARTS...: writes the page to OUT. Replaces each
// @NAME@ in the page with the part of that name.
const fs = require("fs");
const zlib = require("zlib");
const [out, engine, wasm, page, ...parts] = process.argv.slice(2);

const texts = { "engine.js": fs.readFileSync(engine, "utf8"),
  "engine.wasm": zlib.gzipSync(fs.readFileSync(wasm), { level: 9 }).toString("base64") };
for (const part of parts) texts[part.replace(/.*\//, "")] = fs.readFileSync(part, "utf8");
const inserts = { STYLE: texts["page.css"], MAIN: texts["song.html"], DATA: "@DATA@",
  SCRIPT: texts["shared.js"] + texts["song.js"] };
const song = texts["page.html"].replace(/@([A-Z]+)@/g, (_, name) => inserts[name]);
texts["page.html"] = JSON.stringify(song).replace(/</g, "\\u003c");
fs.writeFileSync(out, fs.readFileSync(page, "utf8").replace(/@([a-z]+\.[a-z]+)@/g, (_, name) => {
  if (texts[name] === undefined) throw new Error("no part " + name);
  return texts[name];
}));
