#pragma once

#include <stdint.h>
#include <stdio.h>
#include <sys/types.h>
#include <time.h>

#include <functional>
#include <string>
#include <vector>

#include "common/export.h"

struct selabel_handle;

// Static helpers of the rescue environment. Messages go to standard output, each line beginning
// with "[ZunoFunc]" and a level. No member keeps state, so any thread may call any of them at any
// time; only the list behind __popen is shared, and it is locked.
class SENTROVA_API ZunoFunc {
 public:
  // Process execution

  // Runs `cmd` with /system/bin/sh and appends what it writes to standard output to `result`, which
  // is not cleared. Output is taken in pieces of a line, at most 127 bytes each; of a piece that
  // holds a NUL byte only the text before it is kept. Blocks until the command ends.
  // Returns the raw wait status (exit code 1 reads as 256), or -1 if the pipe could not be opened
  // or somebody else reaped the child.
  static int Exec_Cmd(const std::string& cmd, std::string& result);

  // Runs `cmd` with /system/bin/sh and blocks until it ends. Returns 0 if it exited with 0 or was
  // reaped by somebody else, -1 if it exited otherwise (127 when there is no shell), was killed by
  // a signal or could not be started.
  static int Exec_Cmd(const std::string& cmd);

  // Starts the program args[0] (a path; PATH is not searched) with `args` as its arguments and does
  // not wait. Returns the child's process id, which the caller reaps, or -1 if `args` is empty or
  // the fork failed. A program that cannot be executed shows only as the child's exit code 1.
  static int Exec_Cmd(const std::vector<std::string>& args);

  // Blocks until the child `pid` ends and stores its raw wait status in `*status` (not null). `cmd`
  // is a label for messages. Returns 0 if it exited with 0 or is no child (any longer), in which
  // case `*status` is untouched; -1 if it exited otherwise, was killed by a signal, or the wait
  // failed (a signal handler interrupted it, for one).
  static int Wait_For_Child(pid_t pid, int* status, std::string cmd);

  // Looks for the end of the child `pid` at once and then every second, `timeout_seconds` times (a
  // negative number: without end), and stores its raw wait status in `*status` (not null). A child
  // that is still running then is killed and given five more seconds to disappear. `cmd` is a label
  // for messages. Returns 0 if the child exited in time, with whatever code, or is no child (any
  // longer); -1 if it was killed, by this function or otherwise, or the wait failed. With -1 as
  // `pid` any child counts, and with 0 any of the own process group; then none is killed.
  static int Wait_For_Child_Timeout(pid_t pid, int* status, const std::string& cmd,
                                    int timeout_seconds);

  // Paths and directories

  // Returns the text after the last "/", or all of `path` if it has none. Get_Filename and
  // get_file_name are the same.
  static std::string Get_Filename(const std::string& path);
  static std::string get_file_name(const std::string& path);

  // Returns the text up to and with the last "/", or all of `path` if it has none.
  static std::string Get_Path(const std::string& path);

  // Returns the text before the last "/", or all of `path` if it has none.
  static std::string get_file_parent(const std::string& path);

  // Returns `path` without trailing slashes and with each run of slashes made one; "/" becomes
  // empty. `add_slash` then appends one slash.
  static std::string Remove_Trailing_Slashes(const std::string& path, bool add_slash);

  // Returns the first component of `path` with a slash in front: "/system" for "/system/bin/sh" and
  // for "system/bin". A path that begins with two slashes is cut at its next slash after those.
  static std::string Get_Root_Path(const std::string& path);

  // Returns whether `path` exists, links followed; false for an empty path or one that may not be
  // looked at.
  static bool Path_Exists(std::string path);

  // As above, and says in `error` why not ("The parameter is empty" or the system's error text);
  // cleared if the path exists.
  static bool Path_Exists(const std::string& path, std::string& error);

  // Returns the size in bytes, links followed, or 0 if `path` cannot be looked at.
  static unsigned long Get_File_Size(const std::string& path);

  // Returns 1 if `path` is a directory, links followed; 0 if it does not exist; 2 if it is
  // something else (with ENOTDIR) or cannot be looked at (with stat's `errno`).
  static int Dir_Status(const std::string& path);

  // Returns a directory-entry type for `path`, links followed: 4 for a directory, block device or
  // socket, 6 for a character device, 1 for a FIFO, 10 for a regular file, 0 if it cannot be looked
  // at.
  static unsigned char Get_D_Type_From_Stat(std::string path);

  // Makes every absent component of `path` with mode 0777 less the umask. The path counts from the
  // root, also without a slash in front. Returns false with mkdir's `errno` and a message at the
  // first that cannot be made; those made before it stay.
  static bool Recursive_Mkdir(const std::string& path);

  // Makes every absent component of `path`, or of what stands before its last "/" if `parent_only`,
  // with `mode` less the umask. With `sehandle` (the caller's, may be null) each gets the label
  // that the handle has for its path and mode, or none if it has none; the calling thread's
  // creation context is none afterwards. Returns true if the directories are there. Otherwise false
  // with `errno`: ENOENT for an empty path or a parent of a bare name, ENOTDIR if something else is
  // in the way, or the error of the call that failed; what was made before it stays.
  static bool Recursive_Mkdir(const std::string& path, unsigned int mode, bool parent_only,
                              const selabel_handle* sehandle);

  // Makes every absent component of `path` and gives it `mode`, whatever the umask, and the owner
  // and group with these ids; components that exist stay as they are. The path counts from the
  // root, also without a slash in front. Returns false with `errno` at the first failure.
  static bool Create_Dir_Recursive(const std::string& path, unsigned int mode, unsigned int owner,
                                   unsigned int group);

  // Removes all that is in the directory `path` and, unless `keep_root`, the directory. Links are
  // removed, not followed; device nodes and entries whose type the file system does not tell are
  // left in place. Returns 0, or -1 with `errno` at the first failure, where it stops.
  static int Remove_Dir(std::string path, bool keep_root);

  // Removes a file. Returns 0, also if `path` or the target of the link that it is does not exist;
  // -2 for an empty path; -1 with unlink's `errno` if it cannot be removed.
  static int Remove_File(std::string path);

  // Returns the paths (`dir`, "/" and the name) of all entries of `dir`, in its own order. Those
  // that cannot be looked at, links followed, are left out with a message. Empty if `dir` cannot be
  // opened, with a message unless it does not exist.
  static std::vector<std::string> Files_In_Dir(std::string dir);

  // Appends to `names` the bare names of those entries of `dir` that exist, links followed, and for
  // whose bare name `match` is true. Returns false if `dir` is empty or cannot be opened, with a
  // message unless it does not exist. What `match` throws, std::bad_function_call if it is empty,
  // passes through.
  static bool GetMatchFileFromDir(const std::string& dir, std::vector<std::string>& names,
                                  std::function<bool(const std::string&)> match);

  // File contents

  // Writes the contents of `source` to `destination`, which is created or truncated, and gives it
  // `mode`. A source that cannot be read, or a copy that breaks off, leaves what was copied,
  // possibly nothing, and is not reported. Returns 0, or -1 if the mode could not be set.
  static int copy_file(std::string source, std::string destination, int mode);

  // Writes the last bytes of `source`, at most `max_bytes`, to `destination`, which is created or
  // truncated, and gives it `mode`. Holds them in memory. The size counts modulo 2^32, as a signed
  // number. Returns 0, also if the destination could not be written or its mode set (the latter
  // with a message); -1 with the destination untouched if `source` is missing or empty, `max_bytes`
  // is less than 1 or there is no memory.
  static int copy_file_tail(std::string source, std::string destination, int max_bytes, int mode);

  // Copies what is in the directory `source` into the directory `destination`, which is made with
  // its parents if absent (its path then counts from the root); files and directories get mode 0755
  // and owner and group 1000. Links are followed; directories whose name begins with "." are left
  // out. Returns 0, also if `source` does not exist or single entries could not be copied (with a
  // message); -1 if `source` cannot be opened or `destination` cannot be made.
  static int copy_dir(std::string source, std::string destination);

  // Shortens the file to its first `new_size` bytes, or its last without `keep_head`, by rewriting
  // it; those bytes are held in memory. The size counts modulo 2^32, as a signed number. Returns 0,
  // also if the file could be read but not written; -1 with the file untouched if it is not longer
  // than `new_size`, cannot be read, `new_size` is negative or there is no memory.
  static int resize_file(std::string path, int new_size, bool keep_head);

  // Cuts the file to `length` bytes or fills it up to them with zeros. Returns false for an empty
  // path, and with `errno` and a message if that fails.
  static bool resize_file(std::string path, unsigned long length);

  // Each of these returns 0 if `path` could be opened, whatever could be read from it, and -1 with
  // a message if not. The first reads one word (white space in front is skipped) and leaves `word`
  // as it is if there is none. The second appends all lines, without their newlines. The third
  // reads one decimal number: 0 if there is text but no number, the largest if it does not fit; an
  // empty file leaves `number` as it is.
  static int read_file(std::string path, std::string& word);
  static int read_file(std::string path, std::vector<std::string>& lines);
  static int read_file(std::string path, unsigned long& number);

  // Makes `content` the contents of the file `path`, created if absent; append_to_file adds it at
  // the end instead. Empty content does nothing. Returns 0, also after a short write, or -1 with a
  // message if the file cannot be opened.
  static int write_to_file(const std::string& path, const std::string& content);
  static int append_to_file(const std::string& path, const std::string& content);

  // Writes `length` zero bytes from the byte offset `start` on to the open file or device `fd`,
  // which stays open and is not synchronised. Returns true when all are written (at once if
  // `length` is less than 1); false with `errno` and a message if the offset cannot be reached or a
  // write fails or is interrupted.
  static bool overwrite_with_zeros(int fd, long start, long length);

  // Returns the size in bytes: of the device if `path` begins with "/dev/block" in whatever case,
  // otherwise of the file, links followed. 0 if it cannot be told.
  static uint64_t file_size(const std::string& path);

  // Truncates a file that exists to length 0. Returns false for an empty or absent path, which is
  // not created, and with open's `errno` if it cannot be opened.
  static bool empty_file(const std::string& path);

  // Text and numbers

  // Takes one double quote off the start of the text (by moving `str`) and one off its end (by
  // overwriting it with a NUL).
  static void Strip_Quotes(char*& str);

  // Splits `s` at each `delim`. A trailing delimiter yields no empty last piece; `skip_empty` drops
  // the other empty pieces too. An empty `s` or a NUL `delim` yields no piece.
  static std::vector<std::string> split_string(const std::string& s, char delim, bool skip_empty);

  // Splits `s` at each character that is one of `delims`, and resumes as many characters later as
  // `delims` has: with several delimiters the characters after a match are skipped. The rest after
  // the last match is the last piece, so an empty `s` is one empty piece. `remove_empty` drops
  // empty pieces.
  static std::vector<std::string> Split_String(const std::string& s, const std::string& delims,
                                               bool remove_empty);

  // Returns `s` without leading and trailing blanks and control characters 9 to 13.
  static std::string Trim(const std::string& s);

  // Returns `value` in decimal.
  static std::string to_string(unsigned long value);

  // Returns the integer at the start of `text`, after white space if any; 0 if there is none, and
  // the nearest int if it does not fit one.
  static int to_number(std::string text);

  // Returns whether an integer that fits an int stands at the start of `text`, after white space if
  // any. What follows it does not matter.
  static bool isNumber(std::string text);

  // Returns an integer drawn uniformly from 1 to 2147483647, from a generator seeded anew by
  // /dev/urandom (by the kernel's random call where that cannot be opened). Not for secrets: the
  // generator has 31 bits of state.
  static int random();

  // Time

  // Returns `end` - `start` with nanoseconds from 0 to 999999999, given that those of both are.
  static timespec timespec_diff(timespec& start, timespec& end);

  // Returns the milliseconds from `start` to `end`, both cut to whole milliseconds, modulo 2^32.
  static int timespec_diff_ms(timespec& start, timespec& end);

  // Returns the local time as YYYY-MM-DD--hh-mm-ss.
  static std::string Get_Current_Date();

  // Properties and devices

  // Sets the property "recovery.perf.mode" to "1" or "0" and gives the device 500 ms to follow.
  // Returns the result of that sleep: 0, or -1 if a signal cut it short.
  static int SetPerformanceMode(bool on);

  // Returns whether the property "ro.build.type" is "eng".
  static bool Is_Eng_Build();

  // Looks every 100 ms, the first time after 100 ms, whether the property `name` has the value
  // `value` (an absent one counts as empty). Returns true as soon as it has, false when
  // `timeout_seconds` are over (at least one look is made) or at once for an empty `name`.
  static bool wait_for_property(std::string name, std::string value, double timeout_seconds);

  // As wait_for_property, but looks whether `path` exists.
  static bool wait_for_block_device(std::string path, double timeout_seconds);

  // Stores the total, free and available (to the unprivileged) bytes of the file system on which
  // `path` lies; not the size of the device that `path` may be. Returns false, with all three 0, if
  // `path` is empty or does not exist, or the file system does not tell.
  static bool Get_Blk_Device_Size(std::string path, unsigned long long& total,
                                  unsigned long long& free, unsigned long long& available);

  // Returns the size in bytes of the block device `path`, 0 if it cannot be opened or is none.
  static unsigned long IOCTL_Get_Block_Size(const char* path);
};

// Starts `command` with /system/bin/sh and returns a stream that reads its standard output (mode
// "r") or writes its standard input ("w"), or null: with EINVAL for any other mode, otherwise with
// the error of the system call that failed. The caller ends it with __pclose. The stream is closed
// in every other child. Any threads may call both functions at the same time.
SENTROVA_API FILE* __popen(const char* command, const char* mode);

// Closes a stream from __popen, blocks until its command ends, through interruptions by signals,
// and returns the raw wait status, or -1 if somebody else reaped the child. A stream that is not
// from __popen yields -1 and stays open.
SENTROVA_API int __pclose(FILE* stream);
