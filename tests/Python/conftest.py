import pytest

pytest_plugins = ["ostra.pytest_plugin"]


@pytest.fixture(params=["native", "usbio"])
def transport(request):
    return request.param
