// analyse.js ENGINE.JS SONG.WAV MODE LENGTH: prints the result of the page's engine as JSON.
const fs = require("fs");
const [path, song, mode, length] = process.argv.slice(2);
require(path)({ wasmBinary: fs.readFileSync(path.replace(/js$/, "wasm")) }).then((engine) => {
  engine.FS.writeFile("/song.wav", fs.readFileSync(song));
  const address = engine.ccall("web_analyse", "number", ["string", "number", "number", "number", "number"],
    ["/song.wav", Number(mode), Number(length), 0, 1]);
  process.stdout.write(engine.UTF8ToString(address));
});
