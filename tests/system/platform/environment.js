// Of node's environment a program of emscripten's has nothing unless it is handed on: here what tests ask for.
Module['preRun'] = () => {
  if (typeof ENV !== 'undefined') {
    for (const [name, value] of Object.entries(process.env)) {
      if (/^(TMPDIR$|TAV_|GTEST_)/.test(name)) {
        ENV[name] = value;
      }
    }
  }
};
