"use strict";
// Each worker handles one song or one marker file. Terminating the worker frees its memory.
self.onmessage = async ({ data }) => {
  try {
    const packed = Uint8Array.from(atob(data.wasm), (c) => c.charCodeAt(0));
    const stream = new Blob([packed]).stream().pipeThrough(new DecompressionStream("gzip"));
    const engine = await createEngine({ wasmBinary: await new Response(stream).arrayBuffer() });
    const call = (name, types, values) => {
      const address = engine.ccall(name, "number", types, values);
      const text = address === 0 ? null : engine.UTF8ToString(address);
      engine._free(address);
      return text;
    };
    if (data.wav) {
      const path = "/" + data.name.replace(/\//g, "_");
      engine.FS.writeFile(path, new Uint8Array(data.wav), { canOwn: true });
      self.postMessage(call("web_analyse", ["string", "number", "number", "number", "number"],
        [path, data.mode, data.length, data.maxBeats, data.channels]));
    } else {
      self.postMessage(call("web_markers", ["string", "number", "string", "string"],
        [JSON.stringify(data.result), data.length, data.format, data.fps]));
    }
  } catch (error) {
    self.postMessage({ error: "There is not enough memory to analyse the song." });
  }
};
