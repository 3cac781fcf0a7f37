// Command lookup in the table, form check, handler call and answer framing.
#pragma once

// 4 when the command was found (and answered), 1 when it is not in the table.
int process_cmd_line(char* line);
// 1 found and answered, 0 not in the table.
int pemu_command_hdlr(char* line);
// The form bit of a line (OP_INVALID … OP_ACTION).
int classify_command_form(const char* line);
