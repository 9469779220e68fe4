#pragma once

// For the command's start. Signals that end it remove what it has half written and say so on the standard error; a file
// size limit becomes a write that fails. What was ignored at the start stays ignored.
void TellOfSignals();
