// What can be done with a task, wherever it is shown.
import { attempt, confirm, tell } from "./dialogs.js";
import { change } from "./tool.js";
import { oneAtATime } from "./turns.js";
import { titleOf } from "./words.js";
import { _, format, short } from "./text.js";

// The task that was shown, and no other one that has been given its number meanwhile.
function named(task) {
  return [String(task.id), "--if-name=" + task.name];
}

// For questions about a task.
function subjectOf(model, task) {
  return {
    model,
    isThere: () => !model.isListed || (model.taskOf(task.id) || {}).name === task.name,
    gone: format(_("$0 is not there any more: nothing was done."), short(titleOf(task))),
  };
}

export const runNow = oneAtATime((task) => attempt(async () => {
  await change(["run", ...named(task)]);
  tell(format(_("$0 was started."), short(titleOf(task))));
}), (task) => task.id);

export function setEnabled(task, isEnabled) {
  return attempt(() => change([isEnabled ? "enable" : "disable", ...named(task)]));
}

export function acknowledge(task) {
  return attempt(() => change(["status", "--acknowledge", String(task.id)]));
}

export async function stopRuns(model, task) {
  const isAgreed = await confirm({
    title: format(_("Stop $0?"), short(titleOf(task))),
    text: _("Its processes are asked to end, and ended after ten seconds. A run that waits does not start."),
    action: _("Stop"),
    subject: subjectOf(model, task),
    isDangerous: true,
  });
  return isAgreed && attempt(() => change(["stop", ...named(task)]));
}

// Whether it was removed.
export async function removeTask(model, task) {
  const isAgreed = await confirm({
    title: format(_("Remove $0?"), short(titleOf(task))),
    text: _("The task is deleted and does not run again. A run that goes on goes on."),
    action: _("Remove"),
    subject: subjectOf(model, task),
    isDangerous: true,
  });
  return isAgreed && attempt(async () => {
    await change(["remove", "--yes", ...named(task)]);
    tell(format(_("$0 was removed."), short(titleOf(task))));
  });
}
