'use strict';
// What module and engine have to say, for whoever wants it; nothing of it is printed.

function createDiagnostics(native) {
  const waiting = [];
  let listener = null;

  function deliver() {
    waiting.push(...native.diagnostics());
    // A listener that throws finds the rest the next time.
    while (waiting.length > 0) {
      const [stream, text] = waiting.splice(0, 2);
      listener?.(text, stream === 1 ? 'stdout' : 'stderr');
    }
  }

  return function take(onDiagnostic) {
    const listened = listener !== null;
    if (listened) deliver(); // what was said before is for the one before
    listener = onDiagnostic;
    if (listened && listener !== null) return;
    process[listener === null ? 'off' : 'on']('exit', deliver);
    native.takeDiagnostics(listener && (() => setImmediate(deliver)));
  };
}

module.exports = { createDiagnostics };
