// The index of songs: sorts them by a column and filters them by name. A line of the data is a song;
// one that failed has only a file and an error.
const songs = JSON.parse(`[${byId("data").textContent.trim().replaceAll("\n", ",")}]`).map(toPlayerTime);
const body = document.querySelector("tbody");
const heads = [...document.querySelectorAll("th:has(button)")];
const keys = ["file", "duration_ms", "bpm", "hl_pos_ms", "beat_count"];  // values of the columns
const order = new Intl.Collator(undefined, { numeric: true });

function miniature(loudness) {
  const picture = shape("svg", { viewBox: "0 0 140 28", role: "img", "aria-label": "Loudness" });
  const top = Math.max(...loudness, 1e-9), step = 140 / Math.max(loudness.length - 1, 1);
  drawLine("loud", loudness.map((value, k) => [k * step, 27 - value / top * 26]), picture);
  return picture;
}

for (const song of songs) {
  const { file, page, error, duration_ms, bpm = "", hl_pos_ms, beat_count = "", loudness } = song;
  const cells = error ? [file, error] : [Object.assign(element("a", file), { href: page }), clock(duration_ms), bpm,
    hl_pos_ms === undefined ? "" : clock(hl_pos_ms), beat_count, miniature(loudness)];
  song.row = body.insertRow();
  for (const content of cells) song.row.insertCell().append(content);
  if (error) song.row.lastChild.colSpan = 5;
}

function sortBy(column) {
  const sign = heads[column].ariaSort === "ascending" ? -1 : 1;
  for (const head of heads) head.ariaSort = null;
  heads[column].ariaSort = sign > 0 ? "ascending" : "descending";
  songs.sort((a, b) => {
    const [p, q] = [a[keys[column]], b[keys[column]]];
    if (p === undefined || q === undefined) return (p === undefined) - (q === undefined);  // missing values last
    return sign * (column === 0 ? order.compare(p, q) : p - q);
  });
  for (const { row } of songs) body.append(row);
}

function search(words) {
  const sought = words.toLowerCase().split(/\s+/);
  for (const { file, row } of songs) row.hidden = !sought.every((word) => file.toLowerCase().includes(word));
  byId("status").textContent = `${songs.filter(({ row }) => !row.hidden).length} of ${songs.length} songs`;
}

heads.forEach((head, column) => head.firstChild.addEventListener("click", () => sortBy(column)));
byId("search").addEventListener("input", (event) => search(event.target.value));
search("");
