// Calls of zelosched, the only program that this page starts: never by a shell.
import { visible } from "./text.js";

const cockpit = window.cockpit;

const PROGRAM = "zelosched";

class ToolError extends Error {
  // What was printed all the same.
  constructor(message, output = "") {
    super(visible(message));
    this.output = output;
  }
}

// Without what is about the words that the page has chosen.
function inSentences(message) {
  return message.split(/^usage: /m)[0].split("\n").map((line) => line.replace(/^zelosched( [a-z-]+)?: /, "").trim())
    .filter((line) => line !== "").join("\n");
}

function start(words, input) {
  const call = cockpit.spawn([PROGRAM, ...words], { superuser: "try", err: "message" });
  if (input !== undefined) call.input(input);
  return call;
}

// What the program prints, and why it failed or null. A program that could not be started at all
// is thrown.
function outcome(words, input) {
  return new Promise((resolve, reject) => {
    start(words, input)
      .then((output) => resolve({ output, fault: null }))
      .catch((error, output) => {
        if (error.exit_status === null || error.exit_status === undefined) {
          reject(new ToolError(cockpit.message(error)));
        } else {
          const fault = inSentences(error.message || "") || cockpit.message(error);
          resolve({ output: output || "", fault });
        }
      });
  });
}

// The answer to a question as JSON. Some answers come with a status that says how bad they are.
export function ask(...words) {
  return askAbout(undefined, ...words);
}

// The same about something that is not stored.
export async function askAbout(input, ...words) {
  const { output, fault } = await outcome([...words, "--json"], input);
  if (output.trim() === "") throw new ToolError(fault || "");
  return JSON.parse(output);
}

let changed = () => {};
export function whenChanged(listener) {
  changed = listener;
}

// Changes something, and gives what the program says to that, when the page knows what came of it.
export async function change(words, input) {
  const { output, fault } = await outcome(words, input);
  await changed();
  if (fault !== null) throw new ToolError(fault, output);
  return output;
}

// Shows each text as it comes; gives what stops it, and `done` is called when there is no more.
export function follow(words, show, done) {
  const call = start(words);
  call.stream(show);
  call.then(() => done(null)).catch((error) => done(visible(inSentences(error.message || ""))));
  return () => call.close("terminated");
}
