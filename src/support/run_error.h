#ifndef KARNET_SUPPORT_RUN_ERROR_H_
#define KARNET_SUPPORT_RUN_ERROR_H_

#include <cstdint>
#include <exception>
#include <string>
#include <utility>

namespace karnet {

// Why a run stops before its end. Code anywhere below the run driver throws
// one; the driver alone turns it into log lines, a message to the user and
// the process's exit code, so that every run ends in one place.
class RunError : public std::exception {
 public:
  enum class Kind {
    kFatal,      // message to the log and, by the run mode, to the user
    kLogged,     // text to the log only
    kMemory,     // the allocator's text to the standard error stream only
    kCancelled,  // the user cancelled from the progress host (exit code 0)
  };

  // The fatal message path: the log gets the message (a newline is added when
  // it holds none) and the user sees it unless buildmode says otherwise.
  static RunError fatal(std::string message, std::int32_t exitCode = 1) {
    return RunError(Kind::kFatal, std::move(message), exitCode);
  }
  // Text for the log only, written like the fatal message.
  static RunError logged(std::string text, std::int32_t exitCode = 1) {
    return RunError(Kind::kLogged, std::move(text), exitCode);
  }
  // A failure of the checked allocator: its message goes to the standard
  // error stream, the log shows only the abnormal end.
  static RunError memory(std::string message) {
    return RunError(Kind::kMemory, std::move(message), 1);
  }
  static RunError cancelled() { return RunError(Kind::kCancelled, "Cancel computation", 0); }

  // The same error with a line for the standard error stream, written before
  // anything else (a message that the log's fixed lines leave out).
  RunError withNotice(std::string notice) && {
    notice_ = std::move(notice);
    return std::move(*this);
  }

  Kind kind() const { return kind_; }
  const std::string& notice() const { return notice_; }
  const std::string& message() const { return message_; }
  std::int32_t exitCode() const { return exitCode_; }
  const char* what() const noexcept override { return message_.c_str(); }

 private:
  RunError(Kind kind, std::string message, std::int32_t exitCode)
      : kind_(kind), message_(std::move(message)), exitCode_(exitCode) {}

  Kind kind_;
  std::string message_;
  std::int32_t exitCode_;
  std::string notice_;
};

}  // namespace karnet

#endif  // KARNET_SUPPORT_RUN_ERROR_H_
