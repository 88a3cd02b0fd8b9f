// The state of the machine as far as the page knows it, shared by all views.
import { ask } from "./tool.js";
import { moment, now, setMachineTime } from "./moments.js";
import { inTurn } from "./turns.js";

// The status without what changes with time alone.
function lasting(status) {
  return JSON.stringify({ ...status, now: null });
}

export class Model extends EventTarget {
  constructor() {
    super();
    this.isAnswered = false; // the machine was asked at least once, with or without success
    this.isLoaded = false; // there are tasks to show, which may be old
    this.isListed = false; // the tasks are up to date
    this.tasks = [];
    this.isPowerLoaded = false;
    this.powerTimes = [];
    this.clock = null;
    this.status = null; // not known
    this.mail = null;
    this.fault = null; // error messages when the machine could not be asked
    this.mayChange = null; // not known yet
    // Asks the machine.
    this.refresh = inTurn(async () => {
      await this.load();
      this.dispatchEvent(new Event("changed"));
    });
  }

  taskOf(id) {
    return this.tasks.find((task) => task.id === id) || null;
  }

  // Whether the tasks cannot be read: the list may be empty or old, and nothing can be added.
  get isDamaged() {
    return !this.isListed || (this.status !== null &&
      this.status.findings.some((finding) => finding.kind === "copies" && finding.severity === "critical"));
  }

  // A request that fails does not affect the others.
  async load() {
    const [list, power, status, mail] = await Promise.allSettled([
      ask("list", "--all"), ask("power", "list"), ask("status"), ask("mail")]);
    if (status.value) setMachineTime(status.value.now);
    this.status = status.value || null;
    this.isListed = Boolean(list.value);
    if (list.value) {
      this.tasks = list.value.tasks;
      this.isLoaded = true;
    }
    if (power.value) {
      this.powerTimes = power.value.power_times;
      this.clock = power.value.clock;
      this.isPowerLoaded = true;
    }
    this.mail = mail.value ? mail.value.mail : null;
    const faults = [list, power, status].filter((one) => one.reason).map((one) => one.reason.message);
    this.fault = faults.length > 0 ? [...new Set(faults)].join("\n") : null;
    this.isAnswered = true;
  }

  // Whether the status has changed, also in what no watched file shows.
  async isOther() {
    const status = await ask("status").catch(() => null);
    return lasting(status) !== lasting(this.status);
  }

  // Seconds until the next time at which something is due.
  secondsToNext() {
    const times = this.tasks.map((task) => moment(task.next_run)).filter((found) => found)
      .map((found) => found.epoch - now());
    return Math.min(...times, Infinity);
  }
}
