// The index of songs: sorts them by a column and filters them by name. A line of the data is a song;
// one that failed has only a file and an error.
const songs = JSON.parse(`[${byId("data").textContent.trim().replaceAll("\n", ",")}]`).map(toPlayerTime);
const body = document.querySelector("#songs tbody");
const heads = [...document.querySelectorAll("#songs thead th")];
const keys = ["file", "duration_ms", "bpm", "hl_pos_ms", "beat_count"];  // values of the columns

function miniature(loudness) {
  const picture = shape("svg", { viewBox: "0 0 140 28", role: "img", "aria-label": "Loudness" }, null);
  const top = Math.max(...loudness, 1e-9), step = 140 / Math.max(loudness.length - 1, 1);
  const points = loudness.map((value, k) => `${(k * step).toFixed(1)} ${(27 - value / top * 26).toFixed(1)}`);
  if (points.length > 1) shape("path", { class: "loud", d: "M" + points.join("L") }, picture);
  return picture;
}

for (const song of songs) {
  song.row = body.insertRow();
  const add = (kind, content) => {
    const cell = song.row.insertCell();
    cell.className = kind;
    cell.append(content);
    return cell;
  };
  if (song.error) {
    add("name", song.file);
    add("", song.error).colSpan = 5;
    continue;
  }
  add("name", Object.assign(element("a", song.file), { href: song.page }));
  add("number", clock(song.duration_ms));
  add("number", song.bpm ?? "");
  add("number", song.hl_pos_ms === undefined ? "" : clock(song.hl_pos_ms));
  add("number", song.beat_count ?? "");
  add("", miniature(song.loudness));
}

function sortBy(column) {
  const sign = heads[column].getAttribute("aria-sort") === "ascending" ? -1 : 1;
  for (const head of heads) head.removeAttribute("aria-sort");
  heads[column].setAttribute("aria-sort", sign > 0 ? "ascending" : "descending");
  const order = new Intl.Collator(undefined, { numeric: true });
  songs.sort((a, b) => {
    const [p, q] = [a[keys[column]], b[keys[column]]];
    if (p === undefined || q === undefined) return (p === undefined) - (q === undefined);  // missing values last
    return sign * (column === 0 ? order.compare(p, q) : p - q);
  });
  body.append(...songs.map((song) => song.row));
}

function search(words) {
  const sought = words.toLowerCase().split(/\s+/);
  let shown = 0;
  for (const { file, row } of songs) {
    row.hidden = !sought.every((word) => file.toLowerCase().includes(word));
    shown += row.hidden ? 0 : 1;
  }
  byId("status").textContent = `${shown} of ${songs.length} songs`;
}

heads.forEach((head, column) => {
  const button = head.querySelector("button");
  if (button) button.addEventListener("click", () => sortBy(column));
});
byId("search").addEventListener("input", (event) => search(event.target.value));
search("");
