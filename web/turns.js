// Work that is never done twice at once.

// A function that starts the work, and does nothing while that goes on: of two clicks one counts. Works
// of different keys go on beside each other.
export function oneAtATime(work, keyOf = () => null) {
  const going = new Set();
  return async (...given) => {
    const key = keyOf(...given);
    if (going.has(key)) return undefined;
    going.add(key);
    try {
      return await work(...given);
    } finally {
      going.delete(key);
    }
  };
}

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
