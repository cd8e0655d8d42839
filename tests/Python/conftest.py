import signal

import pytest

pytest_plugins = ["ostra.pytest_plugin"]

# What is started in the background of a script begins with Ctrl-C ignored.
signal.signal(signal.SIGINT, signal.default_int_handler)


@pytest.fixture(params=["native", "usbio"])
def transport(request):
    return request.param
