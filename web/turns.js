// Work that is never done twice at once.

// A function that starts the work, or has it done once more when it is going on: what has changed
// meanwhile may have come too late for it.
export function inTurn(work) {
  let isWanted = false;
  let going = null;

  async function goOn() {
    while (isWanted) {
      isWanted = false;
      await work();
    }
  }

  return () => {
    isWanted = true;
    going ||= goOn().finally(() => { going = null; });
    return going;
  };
}
