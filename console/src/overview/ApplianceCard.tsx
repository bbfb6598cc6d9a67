import { Card, CardBody, CardTitle } from '@patternfly/react-core/dist/esm/components/Card';
import type { Overview } from '../api/types';
import { t } from '../texts';
import { Loading } from '../ui';
import { Facts } from './Facts';

// The appliance's own name and addresses.
export function ApplianceCard({ overview }: { overview: Overview | undefined }) {
  return (
    <Card component="section" aria-labelledby="card-appliance">
      <CardTitle component="h2" id="card-appliance">
        {t('overview.appliance')}
      </CardTitle>
      <CardBody>
        {overview === undefined ? (
          <Loading inline />
        ) : (
          <Facts
            items={[
              [t('overview.host'), overview.host_name],
              ...overview.interfaces.map((item): [string, string] => [
                item.name,
                item.addresses.length === 0 ? t('overview.noAddress') : item.addresses.join(', '),
              ]),
            ]}
          />
        )}
      </CardBody>
    </Card>
  );
}
