import { Card, CardBody, CardTitle } from '@patternfly/react-core/dist/esm/components/Card';
import type { Member, Overview } from '../api/types';
import { t } from '../texts';
import { Facts } from './Facts';
import { Verdict } from './Verdict';

interface MembershipCardProps {
  member: Member;
  overview: Overview | undefined;
}

// Of which domain the appliance is a member, and how.
export function MembershipCard({ member, overview }: MembershipCardProps) {
  const advanced = member.advance_domain_conf;
  const test = overview?.last_test ?? null;
  const kind = test === null ? 'unknown' : test.success ? 'good' : 'bad';
  const { register_nics: nics, kdc } = advanced;
  return (
    <Card component="section" aria-labelledby="card-membership">
      <CardTitle component="h2" id="card-membership">
        {t('overview.membership')}
      </CardTitle>
      <CardBody className="vorn-stack">
        <Verdict kind={kind} text={t('overview.member', { domain: member.domain_name })} />
        <Facts
          items={[
            [t('overview.domain'), member.domain_name],
            [t('overview.dnsName'), advanced.fqdn_name.toLowerCase()],
            [t('overview.kind'), t(`overview.kind.${member.domain_type}`)],
            [
              t('overview.trusted'),
              t(member.manage_mode === 0 ? 'overview.trusted.on' : 'overview.trusted.off'),
            ],
            [t('overview.dns'), member.dns === '' ? t('common.none') : member.dns.split(',').join(', ')],
            [t('overview.account'), overview?.computer_account ?? null],
            [t('overview.controller'), advanced.enable_advance_option ? kdc : null],
            [
              t('overview.registered'),
              advanced.enable_advance_option && !nics.includes('all') ? nics.join(', ') : null,
            ],
          ]}
        />
      </CardBody>
    </Card>
  );
}
