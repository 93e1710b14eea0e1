// Nothing but the occasion on which the test framework's headers are compiled.
