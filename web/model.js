// What the page knows of the machine: one copy, which all views show.
import { ask } from "./tool.js";
import { moment, now, setMachineTime } from "./moments.js";
import { inTurn } from "./turns.js";

export class Model extends EventTarget {
  constructor() {
    super();
    this.isLoaded = false;
    this.tasks = [];
    this.powerTimes = [];
    this.clock = null;
    this.status = null;
    this.fault = null; // a sentence when the machine could not be asked
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

  async load() {
    try {
      const [list, power, status] = await Promise.all([
        ask("list", "--all"), ask("power", "list"), ask("status")]);
      setMachineTime(status.now);
      this.tasks = list.tasks;
      this.powerTimes = power.power_times;
      this.clock = power.clock;
      this.status = status;
      this.fault = null;
      this.isLoaded = true;
    } catch (error) {
      this.fault = error.message;
    }
  }

  // Seconds until the next time at which something is due.
  secondsToNext() {
    const times = this.tasks.map((task) => moment(task.next_run)).filter((found) => found)
      .map((found) => found.epoch - now());
    return Math.min(...times, Infinity);
  }
}
