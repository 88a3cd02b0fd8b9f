// Calls of zelosched, the only program that this page starts: never by a shell.
import { visible } from "./text.js";

const cockpit = window.cockpit;

const PROGRAM = "zelosched";

class ToolError extends Error {
  // `output`: what was printed in spite of the error.
  constructor(message, output = "") {
    super(visible(message));
    this.output = output;
  }
}

// The messages, without the program's name and the usage line.
function inSentences(message) {
  return message.split(/^usage: /m)[0].split("\n").map((line) => line.replace(/^zelosched( [a-z-]+)?: /, "").trim())
    .filter((line) => line !== "").join("\n");
}

function start(words, input) {
  const call = cockpit.spawn([PROGRAM, ...words], { superuser: "try", err: "message" });
  if (input !== undefined) call.input(input);
  return call;
}

// What the program printed, and why it failed, or null. Throws where there is no exit status, as
// when the program could not be started.
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

// The JSON that a command prints. Some commands print it with an exit status other than 0.
export function ask(...words) {
  return askAbout(undefined, ...words);
}

// The same, with an input for the command.
export async function askAbout(input, ...words) {
  const { output, fault } = await outcome([...words, "--json"], input);
  if (output.trim() === "") throw new ToolError(fault || "");
  return JSON.parse(output);
}

let changed = () => {};
export function whenChanged(listener) {
  changed = listener;
}

// Runs a command that changes something. Gives its output after the page has been updated.
export async function change(words, input) {
  const { output, fault } = await outcome(words, input);
  await changed();
  if (fault !== null) throw new ToolError(fault, output);
  return output;
}

// Calls `show` with each piece of output, and `done` at the end. Gives a function that stops it.
export function follow(words, show, done) {
  const call = start(words);
  call.stream(show);
  call.then(() => done(null)).catch((error) => done(visible(inSentences(error.message || ""))));
  return () => call.close("terminated");
}
