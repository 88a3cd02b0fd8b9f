// What a run printed, or prints.
import { el, fill, setText } from "./dom.js";
import { ask, follow } from "./tool.js";
import { _, format, visible } from "./text.js";

const MOST = 200000; // characters kept of one that goes on: the browser shows no more at once

// Bytes that are no text are shown as U+FFFD.
function decoded(text, encoding) {
  if (text === null) return "";
  if (encoding !== "base64") return text;
  const bytes = Uint8Array.from(window.atob(text), (c) => c.charCodeAt(0));
  return new TextDecoder().decode(bytes);
}

export class Output {
  constructor(run) {
    this.run = run;
    this.text = el("pre", { class: "output", tabindex: "0", role: "group", "aria-label": _("Output") });
    this.note = el("p", { class: "beside", role: "status" });
    this.element = el("div", { class: "output-of-run" }, this.text, this.note);
    this.stop = null;
    this.load();
  }

  load() {
    this.text.hidden = this.run.state === "waiting";
    if (this.run.state === "running") {
      this.follow();
    } else if (this.run.state === "waiting") {
      setText(this.note, _("It waits for its turn, and has printed nothing."));
    } else {
      this.show();
    }
  }

  async show() {
    try {
      const { output } = await ask("log", String(this.run.task), "--run", String(this.run.run));
      const head = decoded(output.head, output.encoding);
      const tail = decoded(output.tail, output.encoding);
      const gap = output.left_out_bytes > 0
        ? el("em", { class: "gap" }, format(_("[$0 bytes are left out here]"), output.left_out_bytes)) : null;
      fill(this.text, visible(head), gap ? "\n" : null, gap, gap ? "\n" : null, visible(tail));
      setText(this.note, head + tail === "" ? _("It printed nothing.") : "");
      this.text.hidden = head + tail === "";
    } catch (error) {
      this.text.hidden = true;
      setText(this.note, error.message);
    }
  }

  // As it comes, from the beginning on.
  follow() {
    let text = "";
    setText(this.note, _("The run goes on."));
    this.stop = follow(["log", String(this.run.task), "--run", String(this.run.run), "--follow"], (more) => {
      text = (text + more).slice(-MOST);
      const isAtEnd = this.text.scrollTop + this.text.clientHeight >= this.text.scrollHeight - 4;
      setText(this.text, visible(text));
      if (isAtEnd) this.text.scrollTop = this.text.scrollHeight;
    }, (fault) => {
      this.stop = null;
      setText(this.note, fault || "");
    });
  }

  // The run as it is now.
  update(run) {
    const wasRunning = this.run.state === "running";
    const isNews = run.state !== this.run.state;
    this.run = run;
    if (!isNews) return;
    if (wasRunning && run.state === "ended" && this.stop) return; // what follows shows the end too
    this.close();
    this.load();
  }

  close() {
    if (this.stop) this.stop();
    this.stop = null;
  }
}
