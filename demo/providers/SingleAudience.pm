# A plugin of LemonLDAP::NG: "aud" as one text, as the device's clients take it, not as a list of one.
package SingleAudience;

use strict;
use Mouse;
use Lemonldap::NG::Portal::Main::Constants qw(PE_OK);

extends 'Lemonldap::NG::Portal::Main::Plugin';

use constant hook => { oidcGenerateIDToken => 'single' };

sub single {
    my ( $self, $req, $payload ) = @_;
    $payload->{aud} = $payload->{aud}->[0] if ref $payload->{aud};
    return PE_OK;
}

1;
