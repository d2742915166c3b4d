# SPDX-License-Identifier: Apache-2.0
"""What Prometheus may know: numbers, and never whose."""
import prometheus_client as prometheus

BUCKETS = (.005, .01, .025, .05, .1, .25, .5, 1, 2, 4, 8, 16, 32)


class Metrics:
    def __init__(self):
        self._registry = prometheus.CollectorRegistry()
        prometheus.ProcessCollector(registry=self._registry)
        self._answers = prometheus.Counter(
            "tslauth_cam_answers", "Answers given", ["what", "status"], registry=self._registry)
        self.account_seconds = prometheus.Histogram(
            "tslauth_cam_account_seconds", "What the answer to a host that wants an account took",
            buckets=BUCKETS, registry=self._registry)
        self._codes = prometheus.Gauge(
            "tslauth_cam_codes", "Codes in each state", ["state"], registry=self._registry)
        self._certificate = prometheus.Gauge(
            "tslauth_cam_certificate_expires_timestamp_seconds",
            "When the service's certificate expires", registry=self._registry)

    def watch(self, doors):
        for name, text, value in (
                ("connections", "Connections that are open", lambda: doors.number),
                ("requests", "Requests that are being answered", lambda: doors.asking),
                ("turned_away", "Connections that found no room", lambda: doors.turned_away)):
            prometheus.Gauge(f"tslauth_cam_{name}", text,
                             registry=self._registry).set_function(value)

    def answered(self, what, status):
        self._answers.labels(what, status).inc()

    def certificate_expires(self, seconds):
        self._certificate.set(seconds)

    def text(self, counts):
        for state, number in counts.items():
            self._codes.labels(state).set(number)
        return prometheus.generate_latest(self._registry)
