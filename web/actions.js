// What can be done with a task, wherever it is shown.
import { attempt, confirm, tell } from "./dialogs.js";
import { change } from "./tool.js";
import { _, format, short } from "./text.js";

export function runNow(task) {
  return attempt(async () => {
    await change(["run", String(task.id)]);
    tell(format(_("$0 was started."), short(task.name)));
  });
}

export function setEnabled(task, isEnabled) {
  return attempt(() => change([isEnabled ? "enable" : "disable", String(task.id)]));
}

export async function stopRuns(task) {
  const isAgreed = await confirm({
    title: format(_("Stop $0?"), short(task.name)),
    text: _("Its processes are asked to end, and ended after ten seconds. A run that waits does not start."),
    action: _("Stop"),
    isDangerous: true,
  });
  return isAgreed && attempt(() => change(["stop", String(task.id)]));
}

// Whether it is gone.
export async function removeTask(task) {
  const isAgreed = await confirm({
    title: format(_("Remove $0?"), short(task.name)),
    text: _("The task is deleted and does not run again. A run that goes on goes on."),
    action: _("Remove"),
    isDangerous: true,
  });
  return isAgreed && attempt(async () => {
    await change(["remove", "--yes", String(task.id)]);
    tell(format(_("$0 was removed."), short(task.name)));
  });
}
