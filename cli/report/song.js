// Draws a song's result on a time axis, in player time (ms), and plays the song.
const song = toPlayerTime(JSON.parse(byId("data").textContent));
const beats = song.beats_ms || [];
const soundStart = -song.offset_ms;
const songEnd = Math.max(soundStart + song.read_ms, song.hl_pos_ms || 0, ...beats.slice(-1));
const hasHighlight = song.hl_pos_ms !== undefined;
const loopEnd = hasHighlight ? Math.min(song.region_end_ms, songEnd) : 0;
const timeline = byId("timeline");
const svg = timeline.querySelector("svg");
const view = { from: 0, to: songEnd };

function line(kind, x, top, bottom) {
  return shape("line", { class: kind, x1: x, x2: x, y1: top, y2: bottom }, svg);
}

// ---- The picture. x is a time in ms, y a percentage of the height. Zooming only changes the view box.

function drawWave() {
  const count = song.wave.length / 2;
  const step = song.read_ms / count;
  const x = (k) => (soundStart + (k + .5) * step).toFixed(1);
  const y = (value) => (24 - value * 22 / 127).toFixed(2);
  let path = "";
  for (let k = 0; k < count; ++k) path += `${k ? "L" : "M"}${x(k)} ${y(song.wave[2 * k + 1])}`;
  for (let k = count; k-- > 0;) path += `L${x(k)} ${y(song.wave[2 * k])}`;
  shape("path", { class: "wave", d: path + "Z" }, svg);
}

function drawLoudness() {
  byId("loudname").hidden = song.loudness.length === 0;
  if (song.loudness.length === 0) return;
  const top = Math.max(...song.loudness, 1e-9);
  const y = (value) => (79 - value / top * 29).toFixed(2);
  // Each value is drawn in the middle of its 6-second window.
  const points = song.loudness.map((value, k) => `${soundStart + 2000 * k + 3000} ${y(value)}`);
  shape("path", { class: "loud", d: "M" + points.join("L") }, svg);
  const mean = y(song.loudness.reduce((sum, value) => sum + value) / song.loudness.length);
  shape("line", { class: "mean", x1: 0, x2: songEnd, y1: mean, y2: mean }, svg);
}

function box(kind, from, to) {
  const end = Math.max(from, to);
  shape("path", { class: kind, d: `M${from} 0L${end} 0L${end} 100L${from} 100Z` }, svg);
}

if (song.searched_ms) {
  box("unsearched", 0, song.searched_ms[0]);
  box("unsearched", song.searched_ms[1], songEnd);
}
byId("unsearched").hidden = !song.searched_ms;
if (hasHighlight) box("region", song.hl_pos_ms, loopEnd);
drawWave();
drawLoudness();
byId("beatname").hidden = beats.length === 0;
for (const beat of beats) line("beat", beat, 83, 98);
if (hasHighlight) line("start", song.hl_pos_ms, 0, 100);
const playhead = line("head", 0, 0, 100);

function drawTicks() {
  const steps = [100, 200, 500, 1e3, 2e3, 5e3, 1e4, 15e3, 3e4, 6e4, 12e4, 3e5, 6e5, 9e5, 18e5, 36e5, 72e5];
  const span = view.to - view.from;
  const most = Math.max(2, timeline.clientWidth / 75);
  const step = steps.find((each) => span / each <= most) || span;
  const ticks = [];
  for (let t = Math.ceil(view.from / step) * step; t <= view.to; t += step) {
    const label = element("span", step < 1000 ? clock(t) : clock(t).replace(/\.\d$/, ""));
    const x = timeline.clientWidth * (t - view.from) / span;
    label.style.left = `${Math.min(timeline.clientWidth - 18, Math.max(18, x))}px`;  // half the width of a label
    ticks.push(label);
  }
  byId("times").replaceChildren(...ticks);
}

// ---- The picture as a file. It shows the visible part of the song. Sizes are in pixels and
// colours are attributes, so that every program draws the same picture.

function pictureSvg() {
  const width = 1200, height = 360, top = 34, bottom = 330;
  const ink = getComputedStyle(document.body);
  const x = (ms) => (width * (ms - view.from) / (view.to - view.from)).toFixed(1);
  const y = (percent) => (top + (bottom - top) * percent / 100).toFixed(1);
  const root = shape("svg", { xmlns: svg.namespaceURI, width, height, viewBox: `0 0 ${width} ${height}`,
    "font-family": "sans-serif", "font-size": 14, fill: ink.color }, null);
  const text = (words, left, base, anchor) => {
    shape("text", { x: left, y: base, "text-anchor": anchor }, root).textContent = words;
  };
  shape("title", {}, root).textContent = song.file;
  shape("rect", { width, height, fill: ink.backgroundColor }, root);
  text(song.file, 8, 22, "start");
  for (const part of svg.children) {
    const style = getComputedStyle(part);
    const look = { class: part.getAttribute("class"), fill: style.fill, stroke: style.stroke, opacity: style.opacity,
      "stroke-width": parseFloat(style.strokeWidth), "stroke-dasharray": style.strokeDasharray };
    const at = (name) => Number(part.getAttribute(name));
    if (part === playhead) continue;
    if (part.tagName === "path") {
      look.d = part.getAttribute("d").replace(/(-?[\d.]+) (-?[\d.]+)/g, (_, ms, percent) => `${x(ms)} ${y(percent)}`);
    } else {
      Object.assign(look, { x1: x(at("x1")), x2: x(at("x2")), y1: y(at("y1")), y2: y(at("y2")) });
    }
    shape(part.tagName, look, root);
  }
  for (const label of byId("times").children) {
    text(label.textContent, width * parseFloat(label.style.left) / timeline.clientWidth, 350, "middle");
  }
  return new XMLSerializer().serializeToString(root);
}

function show(from, to) {
  const span = Math.min(Math.max(to - from, 200), songEnd);
  view.from = Math.min(Math.max(from, 0), songEnd - span);
  view.to = view.from + span;
  svg.setAttribute("viewBox", `${view.from} 0 ${span} 100`);
  drawTicks();
}

function zoom(factor, around) {
  const middle = around === undefined ? player.now() : around;
  const part = Math.min(Math.max((middle - view.from) / (view.to - view.from), 0), 1);
  const span = (view.to - view.from) * factor;
  show(middle - part * span, middle + (1 - part) * span);
}

function zoomToBeat() {
  const now = player.now();
  const nearest = beats.reduce((best, beat) => Math.abs(beat - now) < Math.abs(best - now) ? beat : best);
  show(nearest - 1000, nearest + 1000);
}

// ---- Sound. A linked file plays in an audio element. A page opened from disk cannot route it
// through an audio context, so the clicks have their own context. An embedded file is decoded and
// plays in the context of the clicks, so that both share one clock. Browsers drop the encoder delay
// that the file states, so the page's times exclude it.

let context = null;
function wake() {
  context = context || new AudioContext();
  return context.resume();
}

const audio = byId("audio");
const linked = {
  play: () => audio.play(),
  pause: () => audio.pause(),
  seek: (ms) => { audio.currentTime = ms / 1000; },
  now: () => audio.currentTime * 1000,
  playing: () => !audio.paused && !audio.ended,
};

const embedded = {
  buffer: null, node: null, offset: 0, started: 0, decoding: false,
  async play() {
    if (this.decoding) return;
    if (this.buffer === null) {
      this.decoding = true;
      say("Decoding the song …");
      const text = atob(song.embedded);
      const bytes = Uint8Array.from(text, (c) => c.charCodeAt(0));
      this.buffer = await context.decodeAudioData(bytes.buffer).finally(() => { this.decoding = false; });
      say("");
    }
    this.node = new AudioBufferSourceNode(context, { buffer: this.buffer });
    this.node.connect(context.destination);
    this.started = context.currentTime;
    this.node.start(this.started, this.offset);
  },
  pause() {
    this.offset = this.now() / 1000;
    if (this.node) this.node.stop();
    this.node = null;
  },
  seek(ms) {
    const running = this.node !== null;
    this.pause();
    this.offset = ms / 1000;
    if (running) this.play();
  },
  now() {
    const seconds = this.node ? this.offset + context.currentTime - this.started : this.offset;
    return Math.min(1000 * seconds, this.buffer ? 1000 * this.buffer.duration : songEnd);
  },
  playing() { return this.node !== null && this.now() < 1000 * this.buffer.duration; },
};
const player = song.embedded ? embedded : linked;
if (!song.embedded) audio.src = song.audio;

let scheduled = [];  // click nodes that may still sound
let clickedTo = 0;   // all clicks before this time are scheduled

function dropClicks() {
  for (const node of scheduled) node.stop();
  scheduled = [];
  clickedTo = player.now();
}

function addClicks(now) {
  for (const beat of beats) {
    if (beat < clickedTo || beat < now || beat > now + 300) continue;
    const at = context.currentTime + (beat - now) / 1000;
    const gain = new GainNode(context, { gain: .4 });
    const node = new OscillatorNode(context, { frequency: 1800 });
    gain.gain.setValueAtTime(.4, at);
    gain.gain.exponentialRampToValueAtTime(.001, at + .04);
    node.connect(gain).connect(context.destination);
    node.start(at);
    node.stop(at + .05);
    scheduled.push(node);
    clickedTo = beat + 1;
  }
  scheduled = scheduled.slice(-8);
}

const pressed = (id) => byId(id).getAttribute("aria-pressed") === "true";
function press(id, on) { byId(id).setAttribute("aria-pressed", String(on)); }
function say(words) { byId("status").textContent = words; }

async function togglePlay() {
  if (player.playing()) {
    player.pause();
    dropClicks();
  } else {
    try {
      await wake();
      if (player.now() >= songEnd - 50) player.seek(0);
      dropClicks();
      await player.play();
    } catch (error) {
      say(song.embedded ? "This browser cannot decode the song." : `The song could not be played from ${decodeURIComponent(song.audio)}.`);
    }
  }
  update();
}

function seek(ms) {
  player.seek(Math.min(Math.max(ms, 0), songEnd));
  dropClicks();
  update();
}

// ---- Following the playback.

let spoken = -1;
function update() {
  const now = player.now();
  if (pressed("loop") && player.playing() && now >= loopEnd) return seek(song.hl_pos_ms);
  if (player.playing() && pressed("clicks")) addClicks(now);
  playhead.setAttribute("x1", now);
  playhead.setAttribute("x2", now);
  byId("clock").textContent = `${clock(now)} of ${clock(songEnd)}`;
  byId("play").textContent = player.playing() ? "Pause" : "Play";
  press("play", player.playing());
  if (Math.floor(now / 1000) !== spoken) {
    spoken = Math.floor(now / 1000);
    timeline.setAttribute("aria-valuenow", spoken);
    timeline.setAttribute("aria-valuetext", clock(now));
  }
  if (player.playing() && pressed("follow") && (now < view.from || now > view.to)) {
    const span = view.to - view.from;
    show(now - span / 10, now + span * .9);
  }
}
setInterval(update, 40);

// ---- Controls.

function stepBeat(direction) {
  const now = player.now();
  const to = direction > 0 ? beats.find((beat) => beat > now + 30) : beats.filter((beat) => beat < now - 30).pop();
  if (to !== undefined) seek(to);
}

function timeAt(event) {
  const box = svg.getBoundingClientRect();
  return view.from + (event.clientX - box.left) / box.width * (view.to - view.from);
}

function toggle(id) {
  press(id, !pressed(id));
  if (id === "clicks") dropClicks();
  if (id === "loop" && pressed(id) && (player.now() < song.hl_pos_ms || player.now() >= loopEnd)) seek(song.hl_pos_ms);
}

const actions = {
  play: togglePlay,
  gohl: () => seek(song.hl_pos_ms),
  loop: () => toggle("loop"),
  clicks: () => toggle("clicks"),
  prev: () => stepBeat(-1),
  next: () => stepBeat(1),
  in: () => zoom(.5),
  out: () => zoom(2),
  whole: () => show(0, songEnd),
  tobeat: zoomToBeat,
  follow: () => toggle("follow"),
  picture: () => download(song.file + ".svg", "image/svg+xml", pictureSvg()),
};
const keys = { " ": "play", k: "play", h: "gohl", l: "loop", c: "clicks", ",": "prev", ".": "next", "+": "in", "-": "out", 0: "whole", z: "tobeat", f: "follow" };
for (const id in actions) byId(id).addEventListener("click", actions[id]);

document.addEventListener("keydown", (event) => {
  if (event.ctrlKey || event.metaKey || event.altKey) return;
  if (event.target.closest("button") && (event.key === " " || event.key === "Enter")) return;
  const moves = { ArrowLeft: -5000, ArrowRight: 5000, PageDown: -30000, PageUp: 30000 };
  const action = keys[event.key.toLowerCase()];
  if (event.key in moves && (event.target === timeline || event.key.startsWith("Arrow"))) seek(player.now() + moves[event.key]);
  else if (event.target === timeline && event.key === "Home") seek(0);
  else if (event.target === timeline && event.key === "End") seek(songEnd);
  else if (action && !byId(action).disabled) actions[action]();
  else return;
  event.preventDefault();
});
timeline.addEventListener("pointerdown", (event) => seek(timeAt(event)));
timeline.addEventListener("pointermove", (event) => { if (event.buttons === 1) seek(timeAt(event)); });
timeline.addEventListener("wheel", (event) => {
  if (!event.ctrlKey && event.deltaX === 0) return;
  event.preventDefault();
  const span = view.to - view.from;
  if (event.ctrlKey) zoom(event.deltaY > 0 ? 1.25 : .8, timeAt(event));
  else show(view.from + event.deltaX * span / 1000, view.to + event.deltaX * span / 1000);
}, { passive: false });
addEventListener("resize", drawTicks);
audio.addEventListener("error", () => say(`The song was not found at ${decodeURIComponent(song.audio)}: play it beside this page, or make the page with --embed.`));

async function copy(words) {
  try {
    await navigator.clipboard.writeText(words);
    say(`${words} copied.`);
  } catch (error) {
    say(words);
  }
}

function timeButton(ms) {
  const button = element("button", clock(ms));
  button.addEventListener("click", () => { seek(ms); copy(clock(ms)); });
  return element("li", button);
}

function fact(words, value, isCopied = false) {
  const item = element("li", words + " ", element("b", value));
  if (isCopied) {
    item.style.cursor = "copy";
    item.title = "Copy";
    item.addEventListener("click", () => copy(value));
  }
  byId("facts").append(item);
}

document.title = byId("name").textContent = song.file;
timeline.setAttribute("aria-valuemax", Math.floor(songEnd / 1000));
fact("length", clock(song.duration_ms));
fact("", `${song.sample_rate} Hz, ${song.channels} ${song.channels === 1 ? "channel" : "channels"}`);
if (hasHighlight) {
  const about = song.hl_refined === false ? "about " : "";
  fact("highlight", about + clock(song.hl_pos_ms) + (song.hl_end_ms === undefined ? "" : ` to ${clock(song.hl_end_ms)}`), true);
}
if (song.bpm !== undefined) {
  fact(song.mode === "both" ? "tempo from the highlight on" : "tempo", `${song.bpm} BPM`);
  fact("beats", String(song.beat_count));
}
for (const id of ["gohl", "loop"]) byId(id).disabled = !hasHighlight;
for (const id of ["clicks", "prev", "next", "tobeat"]) byId(id).disabled = beats.length === 0;
byId("beatlist").hidden = beats.length === 0;
byId("beattimes").append(...beats.map(timeButton));
if (song.note) say(song.note);
show(0, songEnd);
update();
