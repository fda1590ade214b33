#include "backends/desktop/accountserver/Transfer.h"

#include "backends/desktop/accountserver/TransferFailure.h"
#include "backends/desktop/accountserver/WipedMemory.h"
#include "generated/WelcomerConfiguration.h"

#include <array>
#include <cstdlib>
#include <memory>
#include <string_view>

namespace welcomer::desktop {

namespace {

constexpr std::string_view kUnix = "unix:";
constexpr std::size_t kMaximumHeaderSize = std::size_t{64} * 1024; // bytes, of all header fields

struct FreeEasy {
    void operator()(CURL* handle) const { curl_easy_cleanup(handle); }
};
struct FreeMulti {
    void operator()(CURLM* handle) const { curl_multi_cleanup(handle); }
};
struct FreeList {
    void operator()(curl_slist* list) const { curl_slist_free_all(list); }
};

// One transfer, as libcurl's callbacks see it. None of them throws.
class Exchange {
  public:
    Exchange(const AccountServerSettings& settings, const std::string& proxy, const char* path,
             RequestBody* body, std::chrono::milliseconds limit)
        : _settings(settings),
          _proxy(proxy),
          _body(body) {
        _address(path);
        _security();
        _limits(limit);
        _request();
        _answer();
    }

    TransferOutcome run(Interruption& interruption) {
        const std::unique_ptr<CURLM, FreeMulti> multi(curl_multi_init());
        if (!multi || !_easy) {
            return {std::nullopt, "there is not enough memory", true, false};
        }
        curl_multi_add_handle(multi.get(), _easy.get());
        const CURLcode code = _wait(multi.get(), interruption);
        TransferOutcome outcome = _outcome(code);
        curl_multi_remove_handle(multi.get(), _easy.get());
        return outcome;
    }

  private:
    template <class Value>
    void _set(CURLoption option, Value value) {
        curl_easy_setopt(_easy.get(), option, value);
    }

    void _address(const char* path) {
        if (_settings.address.starts_with(kUnix)) {
            const std::string socket = _settings.address.substr(kUnix.size());
            _set(CURLOPT_UNIX_SOCKET_PATH, socket.c_str());
            _set(CURLOPT_PROXY, "");
            _set(CURLOPT_PROTOCOLS_STR, "http");
            _set(CURLOPT_URL, (std::string("http://localhost") + path).c_str());
            return;
        }
        const std::string_view address = std::string_view(_settings.address);
        const std::size_t end = address.find_last_not_of('/') + 1;
        _set(CURLOPT_PROTOCOLS_STR, "https");
        _set(CURLOPT_URL, (std::string(address.substr(0, end)) + path).c_str());
        if (!_proxy.empty()) {
            _set(CURLOPT_PROXY, _proxy.c_str());
            _set(CURLOPT_NOPROXY, ""); // the desktop has been asked about this very server
        }
    }

    void _security() {
        _set(CURLOPT_SSLVERSION, static_cast<long>(CURL_SSLVERSION_TLSv1_2));
        _set(CURLOPT_SSL_VERIFYPEER, 1L);
        _set(CURLOPT_SSL_VERIFYHOST, 2L);
        if (!_settings.authority.empty()) {
            _set(CURLOPT_CAINFO, _settings.authority.c_str());
            _set(CURLOPT_CAPATH, static_cast<char*>(nullptr));
        }
        if (!_settings.revocations.empty()) {
            _set(CURLOPT_CRLFILE, _settings.revocations.c_str());
        }
        _set(CURLOPT_FOLLOWLOCATION, 0L);
        _set(CURLOPT_DISALLOW_USERNAME_IN_URL, 1L);
        _set(CURLOPT_CERTINFO, 1L);
    }

    void _limits(std::chrono::milliseconds limit) {
        _set(CURLOPT_NOSIGNAL, 1L);
        _set(CURLOPT_QUICK_EXIT, 1L); // a name that is being looked up holds up nobody who ends
        _set(CURLOPT_CONNECTTIMEOUT_MS,
             static_cast<long>(std::chrono::milliseconds(_settings.connectLimit).count()));
        _set(CURLOPT_TIMEOUT_MS, static_cast<long>(limit.count()));
        _set(CURLOPT_MAXFILESIZE_LARGE, static_cast<curl_off_t>(accountserver::kMaximumBodySize));
    }

    void _request() {
        _set(CURLOPT_HTTP_VERSION, static_cast<long>(CURL_HTTP_VERSION_1_1));
        // A connection of its own: libcurl sends a request once more where a kept one turns out to be closed.
        _set(CURLOPT_FRESH_CONNECT, 1L);
        _set(CURLOPT_FORBID_REUSE, 1L);
        _set(CURLOPT_USERAGENT, ("welcomer/" + std::string(configuration::kVersion)).c_str());
        _add("Accept: application/json, application/x-plist, application/problem+json");
        _set(CURLOPT_PREREQFUNCTION, &Exchange::onConnected);
        _set(CURLOPT_PREREQDATA, static_cast<void*>(this));
        if (_body) {
            _body->rewind();
            const bool isJSON = _body->type() == accountserver::ContentType::JSON;
            _add(isJSON ? "Content-Type: application/json" : "Content-Type: application/x-plist");
            _add("Expect:");
            _set(CURLOPT_POST, 1L);
            _set(CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(_body->size()));
            _set(CURLOPT_READFUNCTION, &Exchange::onRead);
            _set(CURLOPT_READDATA, static_cast<void*>(this));
        }
        _set(CURLOPT_HTTPHEADER, _fields.get());
    }

    void _answer() {
        _set(CURLOPT_ERRORBUFFER, _explanation.data());
        _set(CURLOPT_WRITEFUNCTION, &Exchange::onWrite);
        _set(CURLOPT_WRITEDATA, static_cast<void*>(this));
        _set(CURLOPT_HEADERFUNCTION, &Exchange::onHeader);
        _set(CURLOPT_HEADERDATA, static_cast<void*>(this));
    }

    void _add(const char* field) { _fields.reset(curl_slist_append(_fields.release(), field)); }

    CURLcode _wait(CURLM* multi, Interruption& interruption) {
        const Interruption::Registration registration(interruption, [multi] { curl_multi_wakeup(multi); });
        for (int running = 1; running > 0;) {
            if (interruption.isStopped()) {
                return CURLE_ABORTED_BY_CALLBACK;
            }
            if (curl_multi_perform(multi, &running) != CURLM_OK) {
                return CURLE_FAILED_INIT;
            }
            int left = 0;
            while (const CURLMsg* const message = curl_multi_info_read(multi, &left)) {
                if (message->msg == CURLMSG_DONE) {
                    return message->data.result;
                }
            }
            constexpr int longest = 1000; // milliseconds
            curl_multi_poll(multi, nullptr, 0, longest, nullptr);
        }
        return CURLE_FAILED_INIT;
    }

    template <class Value>
    Value _get(CURLINFO what) const {
        Value value{};
        curl_easy_getinfo(_easy.get(), what, &value);
        return value;
    }

    TransferOutcome _outcome(CURLcode code) {
        if (code == CURLE_OK && _saysItsLength()) {
            return {_whole(), "", false, false};
        }
        const TransferFailure failure{code,
                                      _explanation.data(),
                                      _get<long>(CURLINFO_OS_ERRNO),
                                      _get<long>(CURLINFO_SSL_VERIFYRESULT),
                                      _get<long>(CURLINFO_HTTP_CONNECTCODE),
                                      _isConnected,
                                      _isTooLong || code == CURLE_FILESIZE_EXCEEDED};
        return {std::nullopt, explain(failure, _settings), !_isConnected, mayPass(failure)};
    }

    std::optional<std::string> _field(const char* name) const {
        curl_header* field = nullptr;
        return curl_easy_header(_easy.get(), name, 0, CURLH_HEADER, -1, &field) == CURLHE_OK
                   ? std::optional<std::string>(field->value)
                   : std::nullopt;
    }

    // Of an answer that is as long as its connection nobody knows whether somebody between has cut it off.
    bool _saysItsLength() const {
        constexpr long withoutBody = 204;
        return _field("Content-Length") || _field("Transfer-Encoding") ||
               _get<long>(CURLINFO_RESPONSE_CODE) == withoutBody;
    }

    Reply _whole() {
        Reply reply;
        reply.status = _get<long>(CURLINFO_RESPONSE_CODE);
        const auto textOf = [](const char* text) {
            return std::string(text ? text : "");
        };
        reply.contentType = textOf(_get<const char*>(CURLINFO_CONTENT_TYPE));
        reply.location = textOf(_get<const char*>(CURLINFO_REDIRECT_URL));
        reply.body = std::move(_received);
        if (const auto seconds = _get<curl_off_t>(CURLINFO_RETRY_AFTER); seconds > 0) {
            reply.retryAfter = seconds;
        }
        if (const auto date = _field("Date")) {
            reply.date = _moment(date->c_str());
        }
        reply.certificateUntil = _certificateUntil();
        return reply;
    }

    static std::optional<std::int64_t> _moment(const char* text) {
        const std::time_t moment = curl_getdate(text, nullptr);
        return moment < 0 ? std::nullopt : std::optional<std::int64_t>(moment);
    }

    // Of the server's own certificate, which is the first.
    std::optional<std::int64_t> _certificateUntil() const {
        const auto* const chain = _get<curl_certinfo*>(CURLINFO_CERTINFO);
        if (!chain || chain->num_of_certs < 1) {
            return std::nullopt;
        }
        constexpr std::string_view name = "Expire date:";
        for (const curl_slist* each = chain->certinfo[0]; each; each = each->next) {
            if (std::string_view(each->data).starts_with(name)) {
                return _moment(each->data + name.size());
            }
        }
        return std::nullopt;
    }

    static int onConnected(void* exchange, char* /*address*/, char* /*own*/, int /*port*/, int /*ownPort*/) {
        static_cast<Exchange*>(exchange)->_isConnected = true;
        return CURL_PREREQFUNC_OK;
    }

    static std::size_t onRead(char* buffer, std::size_t size, std::size_t count, void* exchange) {
        return static_cast<Exchange*>(exchange)->_body->read(buffer, size * count);
    }

    static std::size_t onWrite(char* bytes, std::size_t size, std::size_t count, void* exchange) {
        auto& self = *static_cast<Exchange*>(exchange);
        if (self._received.size() + size * count > accountserver::kMaximumBodySize) {
            self._isTooLong = true;
            return 0;
        }
        self._received.append(bytes, size * count);
        return size * count;
    }

    static std::size_t onHeader(char* /*bytes*/, std::size_t size, std::size_t count, void* exchange) {
        auto& self = *static_cast<Exchange*>(exchange);
        self._headerSize += size * count;
        self._isTooLong = self._headerSize > kMaximumHeaderSize;
        return self._isTooLong ? 0 : size * count;
    }

    const AccountServerSettings& _settings;
    const std::string& _proxy;
    RequestBody* const _body;
    std::unique_ptr<curl_slist, FreeList> _fields;
    std::array<char, CURL_ERROR_SIZE> _explanation{};
    std::string _received;
    std::size_t _headerSize = 0;
    bool _isTooLong = false;
    bool _isConnected = false; // ready to carry the request
    const std::unique_ptr<CURL, FreeEasy> _easy{curl_easy_init()};
};

} // namespace

TransferOutcome transfer(const AccountServerSettings& settings, const std::string& proxy, const char* path,
                         RequestBody* body, std::chrono::milliseconds limit, Interruption& interruption) {
    if (!prepareCurl()) {
        return {std::nullopt, "libcurl cannot be used", true, false};
    }
    return Exchange(settings, proxy, path, body, limit).run(interruption);
}

} // namespace welcomer::desktop
