// Everything sent to the system log while an object of this class lives. Linking this seam
// replaces syslog() in the whole program; without an object the lines are dropped.

#pragma once

#include <string>
#include <vector>

class CapturedSyslog {
 public:
  CapturedSyslog();
  ~CapturedSyslog();
  CapturedSyslog(const CapturedSyslog&) = delete;
  CapturedSyslog& operator=(const CapturedSyslog&) = delete;

  // Each line as "<priority> <file> <text>", in order, without the line number:
  // "3 oauth_token.cpp Bad parameters". A line of another form is "<priority> <whole line>".
  std::vector<std::string> lines() const;
  // The formats, as syslog() got them: "%s:%d Bad parameters".
  std::vector<std::string> formats() const;
  void clear();
  // syslog() leaves this errno from now on, as it may after a lost connection.
  void leaveErrno(int error);
};
