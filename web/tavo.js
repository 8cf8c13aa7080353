// The page's list of songs. The browser decodes each file, and a worker analyses it as WAV.
const code = URL.createObjectURL(new Blob([byId("enginecode").textContent], { type: "text/javascript" }));
const wasm = byId("wasm").textContent;
const songPage = JSON.parse(byId("songpage").textContent);
const RATE = 44100;  // Hz
const queue = [];
let busy = false, done = 0, stopCurrent = null, shown = null;

// Returns the sound as a 16-bit mono WAV file. Each sample is the mean of all channels.
function wavOf(sound) {
  const count = sound.length, wav = new ArrayBuffer(44 + 2 * count), head = new DataView(wav);
  const text = (at, letters) => [...letters].forEach((c, i) => head.setUint8(at + i, c.charCodeAt(0)));
  text(0, "RIFF"); head.setUint32(4, 36 + 2 * count, true); text(8, "WAVEfmt ");
  head.setUint32(16, 16, true); head.setUint16(20, 1, true); head.setUint16(22, 1, true);
  head.setUint32(24, sound.sampleRate, true); head.setUint32(28, 2 * sound.sampleRate, true);
  head.setUint16(32, 2, true); head.setUint16(34, 16, true); text(36, "data"); head.setUint32(40, 2 * count, true);
  const channels = [...Array(sound.numberOfChannels).keys()].map((k) => sound.getChannelData(k));
  const samples = new Int16Array(wav, 44);
  for (let i = 0; i < count; ++i) {
    let sum = 0;
    for (const channel of channels) sum += channel[i];
    samples[i] = Math.max(-32768, Math.min(32767, Math.round(32768 * sum / channels.length)));
  }
  return wav;
}

// Runs one request in a new worker. Resolves to the reply, or to null if the request was stopped.
function work(request, transfer = []) {
  const worker = new Worker(code);
  return new Promise((resolve) => {
    stopCurrent = () => resolve(null);
    worker.onmessage = ({ data }) => resolve(data);
    worker.onerror = () => resolve({ error: "This browser cannot run the analysis." });
    worker.postMessage({ ...request, wasm }, transfer);
  }).finally(() => { worker.terminate(); stopCurrent = null; });
}

function fill(entry, words) {
  entry.cells.forEach((cell, i) => { cell.textContent = words[i] || ""; });
}

function fail(entry, sentence) {
  fill(entry, [entry.file.name, sentence]);
  entry.cells[1].colSpan = 4;
  entry.cells.slice(2).forEach((cell) => cell.remove());
}

async function analyse(entry) {
  const { file, mode, length, maxBeats } = entry;
  fill(entry, [file.name, "decoding …"]);
  let sound;
  try {
    sound = await new OfflineAudioContext(1, 1, RATE).decodeAudioData(await file.arrayBuffer());
  } catch (error) {
    return fail(entry, "This browser cannot decode the file.");
  }
  if (entry.stopped) return fail(entry, "Stopped.");
  fill(entry, [file.name, "analysing …"]);
  const channels = sound.numberOfChannels, wav = wavOf(sound);
  sound = null;
  const reply = await work({ wav, name: file.name, mode, length, maxBeats, channels }, [wav]);
  if (reply === null) return fail(entry, "Stopped.");
  if (reply.error) return fail(entry, reply.error);
  const song = entry.song = { ...JSON.parse(reply), file: file.name };
  if (song.error) return fail(entry, song.error);
  const about = song.hl_refined === false ? "about " : "";
  fill(entry, ["", clock(song.duration_ms), song.bpm === undefined ? "" : `${song.bpm} BPM`,
    song.hl_pos_ms === undefined ? "" : about + clock(song.hl_pos_ms), song.beats_ms ? String(song.beats_ms.length) : ""]);
  const open = element("button", file.name);
  open.addEventListener("click", () => show(entry));
  entry.cells[0].append(open);
}

async function run() {
  if (busy) return;
  busy = true;
  byId("stop").disabled = byId("progress").hidden = false;
  while (queue.length > 0) {
    byId("progress").max = done + queue.length;
    byId("progress").value = done;
    byId("status").textContent = `Song ${done + 1} of ${done + queue.length}`;
    await analyse(queue[0]);
    queue.shift();
    ++done;
  }
  busy = false;
  byId("stop").disabled = byId("progress").hidden = true;
  byId("status").textContent = done === 1 ? "1 song done" : `${done} songs done`;
}

function add(files) {
  for (const file of files) {
    const row = byId("songs").tBodies[0].insertRow();
    const entry = { file, cells: [0, 1, 2, 3, 4].map(() => row.insertCell()), mode: Number(byId("mode").value),
      length: Math.floor(byId("length").value) || 0, maxBeats: Math.floor(byId("maxbeats").value) || 0 };
    fill(entry, [file.name, "waiting"]);
    queue.push(entry);
  }
  byId("songs").hidden = byId("songs").tBodies[0].rows.length === 0;
  run();
}

// Shows the song in a page made from the template of --report.
function show(entry) {
  if (shown) URL.revokeObjectURL(shown.song.audio);
  shown = entry;
  entry.song.audio = URL.createObjectURL(entry.file);
  const data = JSON.stringify(entry.song).replace(/</g, "\\u003c");
  const frame = byId("song");
  byId("view").hidden = false;
  frame.onload = () => {
    const fit = () => { frame.style.height = frame.contentDocument.documentElement.offsetHeight + 4 + "px"; };
    fit();
    new ResizeObserver(fit).observe(frame.contentDocument.documentElement);
    frame.contentDocument.getElementById("timeline").focus();
    byId("view").scrollIntoView();
  };
  frame.srcdoc = songPage.replace("@DATA@", () => data);
}

async function saveMarkers() {
  const [format, suffix] = byId("format").value.split(" ");
  const text = await work({ result: shown.song, length: shown.length, format, fps: byId("fps").value });
  if (typeof text !== "string") return;
  const name = shown.file.name;
  download((format === "llc" ? name.replace(/\.[^.]*$/, "") : name) + suffix, "text/plain", text);
}

function stop() {
  for (const entry of queue.splice(1)) fail(entry, "Stopped.");
  if (queue.length > 0) queue[0].stopped = true;
  if (stopCurrent) stopCurrent();
}

byId("files").addEventListener("change", (event) => { add(event.target.files); event.target.value = ""; });
byId("stop").addEventListener("click", stop);
byId("save").addEventListener("click", saveMarkers);
addEventListener("dragover", (event) => { event.preventDefault(); byId("drop").className = "over"; });
addEventListener("dragleave", () => { byId("drop").className = ""; });
addEventListener("drop", (event) => { event.preventDefault(); byId("drop").className = ""; add(event.dataTransfer.files); });
