// Work that does not run twice at the same time.

// A function that starts the work, and does nothing while that runs: of two clicks one counts. Work
// with different keys runs in parallel.
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

// A function that starts the work, or has it repeated once when it is running, as that may have
// missed the last change.
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
