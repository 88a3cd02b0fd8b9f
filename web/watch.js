// Says when something has changed on the machine, as long as somebody looks at the page.
const cockpit = window.cockpit;

// The tasks, the power times, and what becomes of runs.
const FILES = [
  "/tmp/scheduled_tasks",
  "/usr/zelo/etc/power_sched.conf",
  "/tmp/sched_status.sqlite",
  "/usr/zelo/var/history.sqlite",
];
const QUIET = 150; // ms in which what changes is one change: it writes several files
const LOOK = 30000; // ms between looks at what no file tells, such as whether cron runs

export class Watch {
  // `changed` asks the machine; `ticked` shows anew how long ago things are.
  constructor(changed, ticked) {
    this.changed = changed;
    this.ticked = ticked;
    this.channels = [];
    this.timer = null;
    cockpit.addEventListener("visibilitychange", () => this.followVisibility());
    this.followVisibility();
  }

  followVisibility() {
    if (cockpit.hidden) {
      this.stop();
    } else if (this.channels.length === 0) {
      this.start();
    }
  }

  start() {
    for (const path of FILES) {
      // cockpit.file() would read the whole of each file first.
      const channel = cockpit.channel({ payload: "fswatch1", path, superuser: "try" });
      channel.addEventListener("message", () => this.note());
      this.channels.push(channel);
    }
    this.look = window.setInterval(() => {
      this.ticked();
      this.changed();
    }, LOOK);
    this.changed();
  }

  stop() {
    for (const channel of this.channels) channel.close();
    this.channels = [];
    window.clearInterval(this.look);
    window.clearTimeout(this.timer);
    this.timer = null;
  }

  // What follows soon is of the same change.
  note() {
    if (this.timer === null) {
      this.timer = window.setTimeout(() => {
        this.timer = null;
        this.changed();
      }, QUIET);
    }
  }
}
