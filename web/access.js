// Administrative access: whether there is any, and Cockpit's own way to gain it.
import { button, el, fill, newId } from "./dom.js";
import { openDialog } from "./dialogs.js";
import { _ } from "./text.js";

const cockpit = window.cockpit;

// Calls back with whether the user may change the machine, now and when that changes.
export function watchAccess(changed) {
  const permission = cockpit.permission({ admin: true });
  const tell = () => permission.allowed !== null && changed(permission.allowed);
  permission.addEventListener("changed", tell);
  tell();
}

// Cockpit asks for what the machine requires, mostly the password. Then the page reloads.
function askForAccess() {
  const client = cockpit.dbus(null, { bus: "internal" });
  const superuser = client.proxy("cockpit.Superuser", "/superuser");
  const fault = el("p", { class: "fault", role: "alert" });
  const fields = el("div", {}, el("p", { role: "status" }, _("One moment …")));
  const dialog = openDialog(_("Administrative access"), fault, fields);
  dialog.addEventListener("close", () => {
    superuser.Stop();
    client.close();
  });

  superuser.addEventListener("Prompt", (event, message, prompt, initial, isShown, error) => {
    const id = newId();
    const answer = el("input", { id, type: isShown ? "text" : "password", value: initial || "",
      autocomplete: "current-password" });
    const send = (submitted) => {
      submitted.preventDefault();
      superuser.Answer(answer.value);
      fill(fields, el("p", { role: "status" }, _("One moment …")));
    };
    fill(fault, error || "");
    fill(fields, el("form", { on: { submit: send } }, message ? el("p", {}, message) : null,
      el("label", { for: id }, prompt || _("Password")), answer,
      el("div", { class: "actions" }, el("button", { class: "primary" }, _("Authenticate")),
        button(_("Cancel"), { class: "secondary" }, () => dialog.close()))));
    answer.focus();
  });

  function showFault(text) {
    if (!dialog.open) return;
    fill(fields, el("div", { class: "actions" }, button(_("Close"), { class: "secondary" }, () => dialog.close())));
    fill(fault, text);
  }

  function start(bridge) {
    fill(fields, el("p", { role: "status" }, _("One moment …")));
    superuser.Start(bridge).then(() => window.location.reload()).catch((error) => showFault(cockpit.message(error)));
  }

  // The first bridge, which is usually sudo.
  superuser.wait(() => {
    const [first] = superuser.Bridges || [];
    if (first) start(first);
    else showFault(_("This machine gives you no administrative access."));
  });
}

// A note where there is no access; nothing where there is, or where it is not known yet.
export function showAccess(place, mayChange) {
  if (place.dataset.shown === String(mayChange)) return;
  place.dataset.shown = String(mayChange);
  fill(place, mayChange !== false ? null : el("div", { class: "note warn" },
    el("p", {}, _("You see what every user may see. Changing tasks and seeing their runs takes administrative access.")),
    button(_("Turn on administrative access"), { class: "secondary" }, askForAccess)));
}
