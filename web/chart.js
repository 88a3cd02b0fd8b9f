// How long the last runs took, as bars.
import { el, svg } from "./dom.js";
import { durationText, momentText } from "./moments.js";
import { gradeOf, outcomeText } from "./words.js";
import { format, ngettext } from "./text.js";

const MOST = 30;
const WIDTH = 600;
const HEIGHT = 90;
const LEAST = 2; // a run of no time is seen too

// `runs`: the latest first. Null where there are fewer than two to compare.
export function durationChart(runs, open) {
  const shown = runs.filter((run) => run.duration_seconds !== null).slice(0, MOST).reverse();
  if (shown.length < 2) return null;
  const longest = Math.max(...shown.map((run) => run.duration_seconds), 0.001);
  const step = WIDTH / MOST;
  const bars = shown.map((run, i) => {
    const height = Math.max(LEAST, (run.duration_seconds / longest) * HEIGHT);
    const text = format("$0: $1, $2", momentText(run.start || run.queued), durationText(run.duration_seconds), outcomeText(run));
    return svg("rect", { class: "bar " + gradeOf(run), x: (MOST - shown.length + i) * step + 2, y: HEIGHT - height,
      width: step - 4, height, on: { click: () => open(run) } }, svg("title", {}, text));
  });
  const title = format(ngettext("How long the last $0 run took; the longest $1", "How long the last $0 runs took; the longest $1",
    shown.length), shown.length, durationText(longest));
  return el("figure", { class: "chart" },
    svg("svg", { viewBox: `0 0 ${WIDTH} ${HEIGHT}`, role: "img", "aria-label": title, preserveAspectRatio: "none" },
      svg("line", { class: "axis", x1: 0, x2: WIDTH, y1: HEIGHT, y2: HEIGHT }), ...bars),
    el("figcaption", {}, title));
}
