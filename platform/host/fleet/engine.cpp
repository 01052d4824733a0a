#include "fleet/engine.hpp"

#include <arpa/inet.h>
#include <curl/curl.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>
#include <zlib.h>

#include <algorithm>
#include <array>
#include <cstring>
#include <string_view>
#include <utility>

#include "report_format/facts.hpp"
#include "report_format/fleet.hpp"

namespace host {
namespace {

constexpr long kConnectSeconds = 5;
constexpr long kSilentSeconds = 15;   // of an engine that takes rows
constexpr long kInsertSeconds = 120;  // for a batch
constexpr long kSelectSeconds = 600;
constexpr std::size_t kChunk = std::size_t{64} << 10U;
constexpr std::size_t kLongestProblem = 300;
// A run's facts are the largest value; escaped it is at most twice as long.
constexpr std::size_t kLongestRow = 2 * report_format::kLargestFacts + kChunk;

struct CurlCleanup {
  void operator()(CURL* curl) const { curl_easy_cleanup(curl); }
};
struct SlistFree {
  void operator()(curl_slist* list) const { curl_slist_free_all(list); }
};
using CurlPtr = std::unique_ptr<CURL, CurlCleanup>;
using SlistPtr = std::unique_ptr<curl_slist, SlistFree>;

bool is_loopback(const sockaddr& address) {
  if (address.sa_family == AF_INET) {
    sockaddr_in four{};
    std::memcpy(&four, &address, sizeof four);
    return ntohl(four.sin_addr.s_addr) >> 24U == 127;
  }
  sockaddr_in6 six{};
  std::memcpy(&six, &address, sizeof six);
  return address.sa_family == AF_INET6 &&
         (IN6_IS_ADDR_LOOPBACK(&six.sin6_addr) ||
          (IN6_IS_ADDR_V4MAPPED(&six.sin6_addr) && six.sin6_addr.s6_addr[12] == 127));
}

// Whether the node is this machine's by its literal address. On the way there is nothing to save by
// compressing, which would cost both sides more than all else.
bool is_here(std::string_view url) {
  for (const std::string_view here : {"http://127.0.0.1", "http://[::1]"}) {
    if (url.starts_with(here) &&
        (url.size() == here.size() || url[here.size()] == ':' || url[here.size()] == '/')) {
      return true;
    }
  }
  return false;
}

// Bytes of a source as they are asked for, compressed or as they are.
class Upload {
 public:
  explicit Upload(const Engine::Source& source) : source_(source) {
    constexpr int kFast = 1;
    constexpr int kGzip = 15 + 16;
    constexpr int kMemory = 8;
    ok_ = deflateInit2(&stream_, kFast, Z_DEFLATED, kGzip, kMemory, Z_DEFAULT_STRATEGY) == Z_OK;
  }
  Upload(const Upload&) = delete;
  Upload& operator=(const Upload&) = delete;
  ~Upload() { deflateEnd(&stream_); }

  bool ok() const { return ok_; }
  bool has_begun() const { return has_begun_; }

  // Before the first byte is read.
  void compress(bool is_wanted) { is_compressed_ = is_wanted; }

  std::size_t read(char* out, std::size_t size) {
    if (!is_compressed_) {
      has_begun_ = true;
      return source_(out, size);
    }
    stream_.next_out = reinterpret_cast<Bytef*>(out);
    stream_.avail_out = static_cast<uInt>(size);
    while (stream_.avail_out == size && !is_done_) {
      if (stream_.avail_in == 0 && !is_last_) {
        has_begun_ = true;
        stream_.avail_in = static_cast<uInt>(source_(in_.data(), in_.size()));
        stream_.next_in = reinterpret_cast<Bytef*>(in_.data());
        is_last_ = stream_.avail_in == 0;
      }
      is_done_ = deflate(&stream_, is_last_ ? Z_FINISH : Z_NO_FLUSH) == Z_STREAM_END;
    }
    return size - stream_.avail_out;
  }

 private:
  const Engine::Source& source_;
  std::array<char, kChunk> in_{};
  z_stream stream_{};
  bool ok_ = false, is_compressed_ = true, has_begun_ = false, is_last_ = false, is_done_ = false;
};

// Rows out of the bytes of a TabSeparated answer, one in memory at a time.
class Rows {
 public:
  explicit Rows(const Engine::OnRow& on_row) : on_row_(on_row) {}

  bool has_begun() const { return has_begun_; }
  bool is_within_a_row() const { return !row_.empty(); }

  bool feed(std::string_view bytes) {
    while (!bytes.empty()) {
      const std::size_t end = bytes.find('\n');
      if (row_.size() + std::min(end, bytes.size()) > kLongestRow) {
        return false;
      }
      row_.append(bytes.substr(0, end));
      if (end == std::string_view::npos) {
        return true;
      }
      bytes.remove_prefix(end + 1);
      has_begun_ = true;
      report_format::split_fleet_row(row_, fields_);
      const bool goes_on = on_row_(fields_);
      row_.clear();
      if (!goes_on) {
        return false;
      }
    }
    return true;
  }

 private:
  const Engine::OnRow& on_row_;
  std::string row_;
  std::vector<char*> fields_;
  bool has_begun_ = false;
};

// The engine's words for what it refused: "Code: 60, e.displayText() = DB::Exception: Table …".
std::string first_line(std::string text) {
  text.resize(std::min({text.find_first_of("\r\n"), text.size(), kLongestProblem}));
  return text.empty() ? "no reason given" : report_format::facts_text(text);
}

}  // namespace

class Engine::Transfer {
 public:
  explicit Transfer(FleetConf conf) : conf_(std::move(conf)) {
    set(CURLOPT_PROTOCOLS_STR, "http,https");
    set(CURLOPT_PROXY, "");
    set(CURLOPT_FOLLOWLOCATION, 0L);
    set(CURLOPT_NOSIGNAL, 1L);
    set(CURLOPT_QUICK_EXIT, 1L);  // a name server that doesn't answer holds nothing up
    set(CURLOPT_CONNECTTIMEOUT, kConnectSeconds);
    set(CURLOPT_OPENSOCKETFUNCTION, &Transfer::on_open);
    set(CURLOPT_OPENSOCKETDATA, this);
    set(CURLOPT_WRITEFUNCTION, &Transfer::on_answer);
    set(CURLOPT_WRITEDATA, this);
    set(CURLOPT_ERRORBUFFER, static_cast<char*>(error_));
    if (!conf_.user.empty()) {
      set(CURLOPT_HTTPAUTH, CURLAUTH_BASIC);
      set(CURLOPT_USERNAME, conf_.user.c_str());
      set(CURLOPT_PASSWORD, conf_.password.c_str());
    }
  }

  bool select(std::size_t node, const std::string& query, const std::string& sql, Rows& rows) {
    set(CURLOPT_UPLOAD_BUFFERSIZE, static_cast<long>(kChunk));
    set(CURLOPT_ACCEPT_ENCODING, is_here(conf_.urls[node]) ? nullptr : "gzip");
    set(CURLOPT_POSTFIELDS, sql.c_str());
    set(CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(sql.size()));
    set(CURLOPT_TIMEOUT, kSelectSeconds);
    set(CURLOPT_LOW_SPEED_LIMIT, 0L);
    prepare(node, query, {}, &rows);
    return finish(curl_ && headers_ ? curl_easy_perform(curl_.get()) : CURLE_OUT_OF_MEMORY);
  }

  // Ready to be performed, then finish() says how it went.
  void prepare_insert(std::size_t node, const std::string& query, Upload& upload) {
    set(CURLOPT_POSTFIELDS, static_cast<char*>(nullptr));
    set(CURLOPT_POSTFIELDSIZE_LARGE, curl_off_t{-1});
    set(CURLOPT_READFUNCTION, &Transfer::on_read);
    set(CURLOPT_READDATA, &upload);
    set(CURLOPT_TIMEOUT, kInsertSeconds);
    set(CURLOPT_LOW_SPEED_LIMIT, 1L);
    set(CURLOPT_LOW_SPEED_TIME, kSilentSeconds);
    constexpr const char* kChunked = "Transfer-Encoding: chunked";
    constexpr const char* kBytes = "Content-Type: application/octet-stream";
    if (is_here(conf_.urls[node])) {
      upload.compress(false);
      prepare(node, query, {kChunked, kBytes}, nullptr);
    } else {
      upload.compress(true);
      prepare(node, query, {kChunked, kBytes, "Content-Encoding: gzip"}, nullptr);
    }
  }

  // What came of it, `code` by libcurl's word. False with problem_.
  bool finish(CURLcode code) {
    set(CURLOPT_HTTPHEADER, static_cast<curl_slist*>(nullptr));
    long status = 0;
    curl_easy_getinfo(curl_.get(), CURLINFO_RESPONSE_CODE, &status);
    constexpr long kFine = 200;
    is_refused_ = status != 0 && status != kFine;
    if (is_refused_) {
      problem_ = conf_.urls[asked_] + " refused: " + first_line(refusal_);
      return false;
    }
    if (code != CURLE_OK || (rows_ != nullptr && rows_->is_within_a_row())) {
      problem_ = conf_.urls[asked_] + " can't be used: " + reason(code);
      return false;
    }
    return true;
  }

  CURL* handle() const { return curl_.get(); }

  std::string escaped(const std::string& text) const {
    char* raw = curl_easy_escape(curl_.get(), text.c_str(), static_cast<int>(text.size()));
    const std::unique_ptr<char, decltype(&curl_free)> owned(raw, &curl_free);
    return raw != nullptr ? raw : "";
  }

  const FleetConf conf_;
  std::string problem_;
  std::size_t node_ = 0;               // the one that answered last
  std::size_t keeper_ = conf_.home();  // the one that takes rows
  bool is_refused_ = false;            // the last failure was the engine's word, not the way to it

 private:
  template <typename Value>
  void set(CURLoption option, Value value) {
    curl_easy_setopt(curl_.get(), option, value);
  }

  void prepare(std::size_t node, const std::string& query,
               std::initializer_list<const char*> headers, Rows* rows) {
    const std::string url =
        conf_.urls[node] + (conf_.urls[node].ends_with('/') ? "?" : "/?") + query;
    headers_.reset(curl_slist_append(nullptr, "Expect:"));
    for (const char* header : headers) {
      curl_slist* longer = curl_slist_append(headers_.get(), header);
      static_cast<void>(headers_.release());
      headers_.reset(longer);
    }
    set(CURLOPT_URL, url.c_str());
    set(CURLOPT_POST, 1L);
    set(CURLOPT_HTTPHEADER, headers_.get());
    in_clear_ = !conf_.urls[node].starts_with("https:");
    is_kept_secret_ = false;
    asked_ = node;
    rows_ = rows;
    refusal_.clear();
    error_[0] = '\0';
  }

  std::string reason(CURLcode code) const {
    if (is_kept_secret_) {
      return "it isn't this machine and http is no secret, so the password isn't sent; use https, "
             "or insecure = true";
    }
    if (code == CURLE_OK) {
      return "its answer ends within a row";
    }
    std::string text =
        error_[0] != '\0' ? static_cast<const char*>(error_) : curl_easy_strerror(code);
    if (code == CURLE_PEER_FAILED_VERIFICATION) {
      text +=
          "; let it have a certificate for that name from an authority that this server trusts "
          "(update-ca-certificates adds one)";
    }
    return text;
  }

  // The address is what counts, whatever name led to it.
  static curl_socket_t on_open(void* self, curlsocktype /*purpose*/, curl_sockaddr* address) {
    auto& transfer = *static_cast<Transfer*>(self);
    const FleetConf& conf = transfer.conf_;
    if (transfer.in_clear_ && !conf.user.empty() && !conf.insecure && !is_loopback(address->addr)) {
      transfer.is_kept_secret_ = true;
      return CURL_SOCKET_BAD;
    }
    return socket(address->family, address->socktype | SOCK_CLOEXEC, address->protocol);
  }

  static size_t on_read(char* out, size_t size, size_t count, void* upload) {
    return static_cast<Upload*>(upload)->read(out, size * count);
  }

  static size_t on_answer(char* bytes, size_t size, size_t count, void* self) {
    auto& transfer = *static_cast<Transfer*>(self);
    long status = 0;
    curl_easy_getinfo(transfer.curl_.get(), CURLINFO_RESPONSE_CODE, &status);
    const std::string_view text(bytes, size * count);
    constexpr long kFine = 200;
    if (status != kFine) {
      transfer.refusal_.append(
          text.substr(0, kLongestProblem - std::min(kLongestProblem, transfer.refusal_.size())));
    } else if (transfer.rows_ != nullptr && !transfer.rows_->feed(text)) {
      return 0;
    }
    return text.size();
  }

  Rows* rows_ = nullptr;
  std::size_t asked_ = 0;  // the node
  SlistPtr headers_;
  std::string refusal_;
  bool in_clear_ = false, is_kept_secret_ = false;
  char error_[CURL_ERROR_SIZE] = "";
  const CurlPtr curl_{curl_easy_init()};  // last, since its cleanup still calls back
};

// Several inserts under way at once: an engine reads the rows of one on one processor, and puts
// them into their place while nothing more comes.
class Engine::Beside {
 public:
  // As Transfer's, of each upload; false, and the others are given up, when one fails. Not more of
  // them than Transfers that there is memory for.
  bool insert(const FleetConf& conf, std::size_t node, const std::string& query,
              const std::vector<std::unique_ptr<Upload>>& uploads) {
    while (transfers_.size() < uploads.size()) {
      transfers_.push_back(std::make_unique<Transfer>(conf));
    }
    std::size_t running = 0;
    for (; running < uploads.size(); ++running) {
      Transfer& transfer = *transfers_[running];
      transfer.prepare_insert(node, query, *uploads[running]);
      if (curl_multi_add_handle(multi_.get(), transfer.handle()) != CURLM_OK) {
        break;
      }
    }
    failed_ = running < uploads.size() ? transfers_[running].get() : nullptr;
    if (failed_ != nullptr) {
      failed_->finish(CURLE_OUT_OF_MEMORY);
    }
    for (std::size_t left = running; left > 0 && failed_ == nullptr;) {
      left -= perform();
    }
    for (std::size_t i = 0; i < running; ++i) {
      curl_multi_remove_handle(multi_.get(), transfers_[i]->handle());
    }
    return failed_ == nullptr;
  }
  // The one that failed last.
  const Transfer& failed() const { return *failed_; }

 private:
  // Goes on for a moment. How many have ended.
  std::size_t perform() {
    constexpr int kMomentMs = 1000;
    int still = 0;
    CURLMcode code = curl_multi_perform(multi_.get(), &still);
    std::size_t ended = 0;
    int waiting = 0;
    while (const CURLMsg* message = curl_multi_info_read(multi_.get(), &waiting)) {
      const auto transfer =
          std::find_if(transfers_.begin(), transfers_.end(),
                       [&](const auto& each) { return each->handle() == message->easy_handle; });
      ++ended;
      failed_ = (*transfer)->finish(message->data.result) ? failed_ : transfer->get();
    }
    if (code == CURLM_OK && ended == 0) {
      code = curl_multi_poll(multi_.get(), nullptr, 0, kMomentMs, nullptr);
    }
    if (code != CURLM_OK) {
      failed_ = transfers_.front().get();
      failed_->finish(CURLE_OUT_OF_MEMORY);
    }
    return ended;
  }

  struct MultiCleanup {
    void operator()(CURLM* multi) const { curl_multi_cleanup(multi); }
  };

  const std::unique_ptr<CURLM, MultiCleanup> multi_{curl_multi_init()};
  std::vector<std::unique_ptr<Transfer>> transfers_;
  Transfer* failed_ = nullptr;
};

Engine::Engine(const FleetConf& conf)
    : transfer_(std::make_unique<Transfer>(conf)), inserts_(std::make_unique<Beside>()) {}
Engine::~Engine() = default;

namespace {

// The statement's answer is kept by the engine until it is whole, on its disk when it is long.
// Nothing that a profile of the engine's users says cuts it short in silence. All statements go to
// the same replicas, as long as these answer.
constexpr char kSelectQuery[] =
    "default_format=TabSeparated&wait_end_of_query=1&buffer_size=1048576"
    "&enable_http_compression=1&http_zlib_compression_level=1&max_execution_time=590&distributed_"
    "product_mode=global"
    "&max_query_size=16777216&max_ast_elements=1000000"
    "&load_balancing=in_order&skip_unavailable_shards=0"
    "&read_overflow_mode=throw&group_by_overflow_mode=throw&sort_overflow_mode=throw"
    "&result_overflow_mode=throw&timeout_overflow_mode=throw&set_overflow_mode=throw"
    "&join_overflow_mode=throw&transfer_overflow_mode=throw&distinct_overflow_mode=throw"
    "&database=";

}  // namespace

bool Engine::select(const std::string& sql, const OnRow& on_row) {
  Transfer& transfer = *transfer_;
  std::string before;
  for (std::size_t tried = 0; tried < nodes(); ++tried) {
    Rows rows(on_row);
    const std::size_t node = (transfer.node_ + tried) % nodes();
    if (transfer.select(node, kSelectQuery + transfer.conf_.database, sql, rows)) {
      transfer.node_ = node;
      return true;
    }
    if (rows.has_begun() || transfer.is_refused_) {
      break;
    }
    before += before.empty() ? transfer.problem_ : "; " + transfer.problem_;
    transfer.problem_ = before;
  }
  return false;
}

bool Engine::insert(const std::string& table, const char* format,
                    const std::vector<Source>& sources) {
  Transfer& transfer = *transfer_;
  std::vector<std::unique_ptr<Upload>> uploads;
  bool ok = true;
  for (const Source& source : sources) {
    uploads.push_back(std::make_unique<Upload>(source));
    ok = ok && uploads.back()->ok();
  }
  const std::string query =
      "database=" + transfer.conf_.database + "&query=" +
      transfer.escaped("INSERT INTO " + transfer.conf_.part_of(table) + " FORMAT " + format);
  std::string before;
  for (std::size_t tried = 0; tried < nodes() && ok; ++tried) {
    const std::size_t node = (transfer.keeper_ + tried) % nodes();
    if (inserts_->insert(transfer.conf_, node, query, uploads)) {
      transfer.keeper_ = node;
      return true;
    }
    const Transfer& failed = inserts_->failed();
    if (std::any_of(uploads.begin(), uploads.end(),
                    [](const auto& upload) { return upload->has_begun(); })) {
      // What comes next goes elsewhere: another node may take what this one doesn't.
      transfer.keeper_ = (node + 1) % nodes();
      transfer.problem_ = failed.problem_;
      break;
    }
    before += before.empty() ? failed.problem_ : "; " + failed.problem_;
    transfer.problem_ = before;
  }
  return false;
}

bool Engine::execute(std::size_t node, const std::string& sql) {
  return select_on(node, sql, [](const auto&) { return true; });
}

bool Engine::select_on(std::size_t node, const std::string& sql, const OnRow& on_row) {
  Rows rows(on_row);
  return transfer_->select(node, kSelectQuery + std::string("default"), sql, rows);
}

std::size_t Engine::nodes() const {
  return transfer_->conf_.urls.size();
}

const FleetConf& Engine::conf() const {
  return transfer_->conf_;
}

bool Engine::is_silent() const {
  return !transfer_->is_refused_;
}

const std::string& Engine::problem() const {
  return transfer_->problem_;
}

}  // namespace host
