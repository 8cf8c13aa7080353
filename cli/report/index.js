// The index of songs: sorts them by a column and filters them by name.
const body = document.querySelector("#songs tbody");
const heads = [...document.querySelectorAll("#songs thead th")];

// Returns a function that compares rows by the text of the first column or by the data-value of any
// other column. Rows without a data-value come last.
function compare(column, sign) {
  return (a, b) => {
    const [x, y] = [a.cells[column], b.cells[column]];
    const [p, q] = [x && x.dataset.value, y && y.dataset.value];
    if (column > 0 && (p === undefined || q === undefined)) return (p === undefined) - (q === undefined);
    return sign * (column > 0 ? p - q : x.textContent.localeCompare(y.textContent, undefined, { numeric: true }));
  };
}

function sortBy(column) {
  const sign = heads[column].getAttribute("aria-sort") === "ascending" ? -1 : 1;
  for (const head of heads) head.removeAttribute("aria-sort");
  heads[column].setAttribute("aria-sort", sign > 0 ? "ascending" : "descending");
  body.append(...[...body.rows].sort(compare(column, sign)));
}

function search(words) {
  const sought = words.toLowerCase().split(/\s+/);
  let shown = 0;
  for (const row of body.rows) {
    const name = row.cells[0].textContent.toLowerCase();
    row.hidden = !sought.every((word) => name.includes(word));
    shown += row.hidden ? 0 : 1;
  }
  byId("status").textContent = `${shown} of ${body.rows.length} songs`;
}

heads.forEach((head, column) => {
  const button = head.querySelector("button");
  if (button) button.addEventListener("click", () => sortBy(column));
});
byId("search").addEventListener("input", (event) => search(event.target.value));
search("");
