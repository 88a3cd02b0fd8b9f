// What a run printed, or prints.
import { el, fill, setText } from "./dom.js";
import { ask, follow } from "./tool.js";
import { _, format, ngettext, visible } from "./text.js";

const cockpit = window.cockpit;

const MOST = 64000; // characters shown of a run under way, and of beginning and end of an ended one
const PAUSE = 200; // ms between two updates, as a run may print very fast
const PIECES = 100; // text nodes: more are merged

// As much Base64 as MOST characters can take, so that not all is decoded: a character has at most
// four bytes, and three bytes take four characters of Base64.
const MOST_BASE64 = Math.ceil((MOST * 4) / 3) * 4;

// Bytes that are no text are shown as U+FFFD. `cut` gives the part that is shown.
function decoded(text, encoding, cut) {
  const most = encoding === "base64" ? MOST_BASE64 : MOST;
  const part = cut(text || "", most);
  const whole = visible(encoding !== "base64" ? part
    : new TextDecoder().decode(Uint8Array.from(window.atob(part), (c) => c.charCodeAt(0))));
  return { shown: cut(whole, MOST), isCut: part !== (text || "") || whole.length > MOST };
}

const beginningOf = (text, most) => text.slice(0, most);
const endOf = (text, most) => (text.length > most ? text.slice(-most) : text);

export class Output {
  constructor(run) {
    this.run = run;
    this.text = el("pre", { class: "output", tabindex: "0", role: "group", "aria-label": _("Output") });
    this.note = el("p", { class: "beside", role: "status" });
    this.element = el("div", { class: "output-of-run" }, this.text, this.note);
    this.stop = null;
    // A hidden page does not follow a run; when it is shown again, it starts from the beginning.
    this.look = () => {
      if (cockpit.hidden) this.stopFollowing();
      else if (this.run.state === "running") this.load();
    };
    cockpit.addEventListener("visibilitychange", this.look);
    this.load();
  }

  load() {
    this.stopFollowing();
    this.text.hidden = this.run.state === "waiting";
    if (this.run.state === "running") {
      this.follow();
    } else if (this.run.state === "waiting") {
      setText(this.note, _("It waits for its turn, and has printed nothing."));
    } else {
      this.show();
    }
  }

  words() {
    return ["log", String(this.run.task), "--run", String(this.run.run)];
  }

  async show() {
    try {
      const { output } = await ask(...this.words());
      const head = decoded(output.head, output.encoding, beginningOf);
      const tail = decoded(output.tail, output.encoding, endOf);
      const isCut = head.isCut || tail.isCut;
      const isNothing = head.shown + tail.shown === "";
      fill(this.text, head.shown, ...this.gap(output.left_out_bytes, isCut), tail.shown);
      setText(this.note, isNothing ? _("It printed nothing.") : isCut ? this.whereAllIs() : "");
      this.text.hidden = isNothing;
    } catch (error) {
      this.text.hidden = true;
      setText(this.note, error.message);
    }
  }

  gap(bytes, isCut) {
    if (bytes === 0 && !isCut) return [];
    const text = isCut ? _("[more is left out here]")
      : format(ngettext("[$0 byte is left out here]", "[$0 bytes are left out here]", bytes), bytes);
    return ["\n", el("em", { class: "gap" }, text), "\n"];
  }

  whereAllIs() {
    return format(_("All that is kept of it shows: $0"), "zelosched " + this.words().join(" "));
  }

  // Shows the output as it comes, from the beginning on; of very much only the end.
  follow() {
    let coming = "";
    let timer = null;
    fill(this.text);
    setText(this.note, _("The run goes on."));
    const draw = () => {
      timer = null;
      this.append(visible(coming));
      coming = "";
    };
    const stop = follow([...this.words(), "--follow"], (more) => {
      coming = endOf(coming + more, MOST);
      if (timer === null) timer = window.setTimeout(draw, this.text.firstChild ? PAUSE : 0);
    }, (fault) => {
      if (this.stop !== end) return;
      this.stop = null;
      window.clearTimeout(timer);
      draw();
      this.text.hidden = !this.text.firstChild;
      setText(this.note, fault || (this.isCut ? this.whereAllIs() : this.text.firstChild ? "" : _("It printed nothing.")));
    });
    const end = () => {
      window.clearTimeout(timer);
      stop();
    };
    this.isCut = false;
    this.stop = end;
  }

  // Appends to what is shown, and removes the oldest where it is too much.
  append(more) {
    if (more === "") return;
    const { text } = this;
    const isAtEnd = text.scrollTop + text.clientHeight >= text.scrollHeight - 4;
    text.append(endOf(more, MOST));
    let size = 0;
    for (const piece of text.childNodes) size += piece.data.length;
    for (; size - text.firstChild.data.length >= MOST; text.firstChild.remove()) size -= text.firstChild.data.length;
    if (size > MOST) text.firstChild.deleteData(0, size - MOST);
    this.isCut = this.isCut || size > MOST || more.length > MOST;
    if (text.childNodes.length > PIECES) text.normalize();
    if (isAtEnd) text.scrollTop = text.scrollHeight;
  }

  // The run as it is now.
  update(run) {
    const wasRunning = this.run.state === "running";
    const isNews = run.state !== this.run.state;
    this.run = run;
    if (!isNews) return;
    if (wasRunning && run.state === "ended" && this.stop) return; // the follower shows the end too
    this.load();
  }

  stopFollowing() {
    if (this.stop) this.stop();
    this.stop = null;
  }

  close() {
    this.stopFollowing();
    cockpit.removeEventListener("visibilitychange", this.look);
  }
}
