"""A small browser: cookies, redirects that are shown one by one, links and forms. No scripts."""

import html.parser
import http.cookiejar
import json
import ssl
import urllib.error
import urllib.parse
import urllib.request

TIMEOUT = 30


class BrowserError(Exception):
    pass


class _Stay(urllib.request.HTTPRedirectHandler):
    def redirect_request(self, *_):
        return None


class _Elements(html.parser.HTMLParser):
    """Collects links, forms with their fields, and the text of a page."""

    def __init__(self):
        super().__init__()
        self.links, self.forms, self.text = [], [], []

    def handle_starttag(self, tag, attrs):
        attrs = dict(attrs)
        if tag == "a" and "href" in attrs:
            self.links.append(attrs)
        elif tag == "form":
            self.forms.append({**attrs, "fields": {}})
        elif tag == "input" and self.forms and "name" in attrs:
            self.forms[-1]["fields"][attrs["name"]] = attrs.get("value", "")

    def handle_data(self, data):
        self.text.append(data)


class Page:
    def __init__(self, url, status, headers, body):
        self.url, self.status, self.headers, self.body = url, status, headers, body

    @property
    def location(self):
        """Where a redirect points, as an absolute URL; None when the page is not a redirect."""
        target = self.headers.get("Location")
        if self.status not in (301, 302, 303, 307, 308) or target is None:
            return None
        return urllib.parse.urljoin(self.url, target)

    def _elements(self):
        elements = _Elements()
        elements.feed(self.body)
        return elements

    def link(self, identity):
        for attrs in self._elements().links:
            if attrs.get("id") == identity:
                return urllib.parse.urljoin(self.url, attrs["href"])
        raise BrowserError(f"no link '{identity}' on {self.url}")

    def form(self, identity):
        for form in self._elements().forms:
            if form.get("id") == identity:
                return form
        raise BrowserError(f"no form '{identity}' on {self.url}")

    @property
    def text(self):
        return " ".join("".join(self._elements().text).split())


class Browser:
    def __init__(self, authority):
        self.cookies = http.cookiejar.CookieJar()
        context = ssl.create_default_context(cafile=authority)
        context.verify_flags |= ssl.VERIFY_X509_STRICT  # as Python does from 3.13 on
        self._opener = urllib.request.build_opener(
            urllib.request.ProxyHandler({}),
            urllib.request.HTTPSHandler(context=context),
            urllib.request.HTTPCookieProcessor(self.cookies), _Stay())

    def get(self, url, headers=None):
        """Fetches one page; a redirect is returned, not followed."""
        return self._send(urllib.request.Request(url.split("#")[0], headers=headers or {}), url)

    def submit(self, page, identity):
        """Sends a form of a page unchanged."""
        form = page.form(identity)
        url = urllib.parse.urljoin(page.url, form.get("action", ""))
        if form.get("method", "get").lower() == "get":
            return self.get(f"{url}?{urllib.parse.urlencode(form['fields'])}")
        return self.post(url, form["fields"])

    def post(self, url, fields, headers=None):
        data = urllib.parse.urlencode(fields).encode()
        return self._send(urllib.request.Request(url, data, headers or {}), url)

    def call(self, method, url, value=None):
        """Calls a JSON interface as a page's script does; any answer but 200 is an error."""
        data = None if value is None else json.dumps(value).encode()
        request = urllib.request.Request(url, data, {"Content-Type": "application/json"},
                                         method=method)
        page = self._send(request, url)
        if page.status != 200:
            raise BrowserError(f"{method} {url} answered {page.status}: {page.body[:300]}")
        return json.loads(page.body) if page.body else None

    def _send(self, request, url):
        try:
            answer = self._opener.open(request, timeout=TIMEOUT)
        except urllib.error.HTTPError as error:
            answer = error
        except (urllib.error.URLError, OSError) as error:
            raise BrowserError(f"{urllib.parse.urlsplit(url).netloc}: "
                               f"{getattr(error, 'reason', error)}") from error
        with answer:
            body = answer.read().decode("utf-8", "replace")
        return Page(url, answer.status, answer.headers, body)
